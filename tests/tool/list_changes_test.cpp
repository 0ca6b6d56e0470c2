// SPDX-License-Identifier: Apache-2.0
#include "tools/list_changes.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

ListRow Row(unsigned id, const std::string& name) {
    ListRow row{id, {std::to_string(id), name}, {}};
    row.json.Number("id", id).String("name", name);
    return row;
}

ListRows Rows(const std::vector<unsigned>& ids) {
    ListRows rows;
    for (const unsigned id : ids)
        rows.push_back(Row(id, "thing"));
    return rows;
}

/// "+1 -2 ~3"
std::string Words(const std::vector<ListChange>& changes) {
    std::string words;
    for (const ListChange& change : changes) {
        const char* const mark = change.kind == ListChangeKind::Added     ? "+"
                                 : change.kind == ListChangeKind::Removed ? "-"
                                                                          : "~";
        words += (words.empty() ? "" : " ") + (mark + std::to_string(change.row.id));
    }
    return words;
}

} // namespace

TEST(ListHistory, TellsTheFirstListAsAddedInItsOrder) {
    ListHistory history;
    EXPECT_EQ(Words(history.Follow({})), "");
    EXPECT_EQ(Words(history.Follow(Rows({3, 1, 2}))), "+3 +1 +2");
    EXPECT_EQ(Words(history.Follow(Rows({3, 1, 2}))), "");
}

TEST(ListHistory, DoesNotMindTheOrder) {
    ListHistory history;
    history.Follow(Rows({1, 2, 3}));
    EXPECT_EQ(Words(history.Follow(Rows({3, 2, 1}))), "");
}

TEST(ListHistory, TellsWhatGoesBeforeWhatComesAndChanges) {
    ListHistory history;
    history.Follow(Rows({1, 2, 3, 4}));
    ListRows rows = Rows({9, 4, 2, 8});
    rows[2] = Row(2, "another");
    EXPECT_EQ(Words(history.Follow(rows)), "-1 -3 +9 ~2 +8");
    EXPECT_EQ(Words(history.Follow(rows)), "") << "a change is told once";
    EXPECT_EQ(Words(history.Follow({})), "-9 -4 -2 -8");
    EXPECT_EQ(Words(history.Follow(rows)), "+9 +4 +2 +8") << "what comes back is new";
}

TEST(ListHistory, ShowsAChangeAsItIsNowAndALossAsItWas) {
    ListHistory history;
    history.Follow({Row(1, "before"), Row(2, "gone")});
    const std::vector<ListChange> changes = history.Follow({Row(1, "after")});
    ASSERT_EQ(Words(changes), "-2 ~1");
    EXPECT_EQ(changes[0].row.cells[1], "gone");
    EXPECT_EQ(changes[1].row.cells[1], "after");
}

TEST(ListHistory, SeesWhatOnlyOneOfTheFormsTells) {
    ListHistory history;
    ListRow row = Row(1, "monitor");
    history.Follow({row});
    row.json.Bool("main", true);
    EXPECT_EQ(Words(history.Follow({row})), "~1");
    row.cells[1] = "screen";
    EXPECT_EQ(Words(history.Follow({row})), "~1");
}

TEST(ListChangeTable, KeepsItsColumnsAndLetsThemGrow) {
    ListChangeTable table({"ID", "NAME", "END"});
    const auto change = [](ListChangeKind kind, std::vector<std::string> cells) {
        return ListChange{kind, {1, std::move(cells), {}}};
    };
    EXPECT_EQ(table.Text({change(ListChangeKind::Added, {"1", "äö", "x"}),
                          change(ListChangeKind::Added, {"12345", "", "y"})}),
              "   ID     NAME  END\n+  1      äö    x\n+  12345  -     y\n");
    EXPECT_EQ(table.Text({change(ListChangeKind::Removed, {"1", "äö", "x"})}), "-  1      äö    x\n");
    EXPECT_EQ(table.Text({change(ListChangeKind::Changed, {"2", "a longer one", "x"})}),
              "~  2      a longer one  x\n");
    EXPECT_EQ(table.Text({change(ListChangeKind::Added, {"3", "b", "x"})}), "+  3      b             x\n");
    EXPECT_EQ(table.Text({}), "");
}

TEST(ListChangeTable, HasHeadingsAboveNothing) {
    ListChangeTable table({"ID", "NAME"});
    EXPECT_EQ(table.Text({}), "   ID  NAME\n");
    EXPECT_EQ(table.Text({}), "");
}

TEST(ListChangeJson, TellsTheChangeFirst) {
    EXPECT_EQ(ListChangeJson({{ListChangeKind::Added, Row(1, "a")},
                              {ListChangeKind::Removed, Row(2, "b")},
                              {ListChangeKind::Changed, Row(3, "c\n")}}),
              "{\"change\": \"added\", \"id\": 1, \"name\": \"a\"}\n"
              "{\"change\": \"removed\", \"id\": 2, \"name\": \"b\"}\n"
              "{\"change\": \"changed\", \"id\": 3, \"name\": \"c\\u000a\"}\n");
    EXPECT_EQ(ListChangeJson({}), "");
}
