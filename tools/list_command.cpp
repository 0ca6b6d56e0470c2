// SPDX-License-Identifier: Apache-2.0
#include "tools/list_command.h"

#include "tools/desktop_state.h"
#include "tools/standard_output.h"
#include "tools/text_table.h"

#include <utility>

namespace {

std::string TableText(const ListKind& list) {
    TextTable table(list.headings);
    for (ListRow& row : list.look())
        table.AddRow(std::move(row.cells));
    return table.Text();
}

std::string JsonText(const ListKind& list) {
    std::vector<std::string> objects;
    for (const ListRow& row : list.look())
        objects.push_back(row.json.Text());
    return JsonArrayText(objects);
}

} // namespace

std::string ListText(const ListKind& list, ListForm form) {
    return form == ListForm::Json ? JsonText(list) : TableText(list);
}

WriteResult PrintList(const ListKind& list, ListForm form) {
    if (std::string problem = ProblemBeforeLook(); !problem.empty())
        return WriteFailure{EXIT_CODE_FAILED, std::move(problem)};
    const DesktopLook look;
    const std::string text = ListText(list, form);
    if (std::string problem = look.ProblemSince(); !problem.empty())
        return WriteFailure{EXIT_CODE_FAILED, std::move(problem)};
    return PrintAnswer(text);
}
