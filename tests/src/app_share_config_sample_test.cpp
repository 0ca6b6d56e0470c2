// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"
#include "tests/support/threads.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <vector>

// The page that tells people how to write the debug file, against the program that reads it.

namespace {

namespace fs = std::filesystem;

std::string ReadWhole(const char* file) {
    std::ifstream stream(file);
    return std::string(std::istreambuf_iterator<char>(stream), {});
}

/// The sample files of a page: what stands between ```json and ```.
std::vector<std::string> SamplesOf(const std::string& page) {
    const std::string open = "```json\n";
    const std::string close = "```";
    std::vector<std::string> samples;
    for (std::size_t start = page.find(open); start != page.npos; start = page.find(open, start)) {
        start += open.size();
        samples.push_back(page.substr(start, page.find(close, start) - start));
    }
    return samples;
}

/// A row of the page's table of keys.
struct Row {
    std::string type;
    std::string normal;
    std::string lowest;
};

std::string Trimmed(const std::string& cell) {
    const std::size_t first = cell.find_first_not_of(' ');
    return first == cell.npos ? "" : cell.substr(first, cell.find_last_not_of(' ') - first + 1);
}

std::vector<std::string> CellsOf(const std::string& line) {
    std::vector<std::string> cells;
    std::istringstream stream(line.substr(1));
    for (std::string cell; std::getline(stream, cell, '|');)
        cells.push_back(Trimmed(cell));
    return cells;
}

/// The rows of the table of keys, by key: its first cell holds the key in backticks, its second "bool" or
/// "int".
std::map<std::string, Row> RowsOf(const std::string& page) {
    std::map<std::string, Row> rows;
    std::istringstream stream(page);
    for (std::string line; std::getline(stream, line);) {
        if (line.rfind("| `", 0) != 0)
            continue;
        const std::vector<std::string> cells = CellsOf(line);
        if (cells.size() < 4 || (cells[1] != "bool" && cells[1] != "int"))
            continue;
        rows[cells[0].substr(1, cells[0].find('`', 1) - 1)] = {cells[1], cells[2], cells[3]};
    }
    return rows;
}

/// What a key sets: its setting as it was stored, and as the capture code gets it.
struct Setting {
    std::function<int()> stored;
    std::function<int()> got;
};

template <class Getter>
Setting Of(const ShareRelaxed<bool>& field, Getter getter) {
    return {[&field] { return static_cast<int>(field); }, [getter] { return static_cast<int>(getter()); }};
}

template <class Getter>
Setting Of(const ShareRelaxed<int>& field, Getter getter) {
    return {[&field] { return static_cast<int>(field); }, [getter] { return getter(); }};
}

/// The keys that the reader's source asks the document for: a key that nobody told the page or this test of
/// would not be seen otherwise.
std::set<std::string> KeysInSource() {
    const std::string source = ReadWhole(SCREENSHARE_CONFIGURATION_SOURCE);
    const std::regex read("Read(?:Switch|Number)\\(\"([^\"]+)\"");
    std::set<std::string> keys;
    for (std::sregex_iterator match(source.begin(), source.end(), read), end; match != end; ++match)
        keys.insert((*match)[1]);
    return keys;
}

/// Every key that the reader knows, and what it sets.
std::map<std::string, Setting> KnownSettings() {
    AppShareConfig& c = *AppShareConfig::Instance();
    return {
        {"dump_point_raw_data",
         Of(c.m_bDumpPointRawData, [&c] { return c.IsCaptureDumpPointDataEnabled(); })},
        {"dump_raw_data_ring_size", Of(c.m_nDumpDataRingSize, [&c] { return c.GetDumpDataRingSize(); })},
        {"dump_raw_data_every_x_frames",
         Of(c.m_nDumpDataEveryFrames, [&c] { return c.GetDumpDataEveryFrames(); })},
        {"dummy_point", Of(c.m_bDummyPoint, [&c] { return c.IsDummyPointEnabled(); })},
        {"dummy_capture", Of(c.m_bDummyCapture, [&c] { return c.IsDummyCaptureEnabled(); })},
        {"dummy_capture_width", Of(c.m_nDummyCaptureWidth, [&c] { return c.GetDummyCaptureWidth(); })},
        {"dummy_capture_height", Of(c.m_nDummyCaptureHeight, [&c] { return c.GetDummyCaptureHeight(); })},
        {"dummy_point_sys_pos", Of(c.m_bDummyPointSysPos, [&c] { return c.IsDummyPointSysPosEnabled(); })},
        {"dummy_enumerator", Of(c.m_bDummyEnumerator, [&c] { return c.IsDummySourceEnabled(); })},
        {"capture_resample_enable",
         Of(c.m_bCaptureResampleEnable, [&c] { return bool(c.m_bCaptureResampleEnable); })},
        {"capture_resample_fixsize_enable",
         Of(c.m_bCaptureResampleFixSizeEnable, [&c] { return bool(c.m_bCaptureResampleFixSizeEnable); })},
        {"capture_resample_width",
         Of(c.m_nResampleScreenCaptureWidth, [&c] { return c.GetResampleScreenCaptureWidth(); })},
        {"capture_resample_height",
         Of(c.m_nResampleScreenCaptureHeight, [&c] { return c.GetResampleScreenCaptureHeight(); })},
        {"EnableWin8MagCapture", Of(c.m_bWin8EnableMag, [&c] { return c.IsWin8EnableMag(); })},
        {"trace_one_by_frames", Of(c.m_nTraceOneByFrames, [&c] { return c.GetFrameTraceFrequency(); })},
        {"screen_capturer_type", Of(c.m_nScreenCapturerType, [&c] { return c.GetScreenCapturerType(); })},
    };
}

template <class Map>
std::set<std::string> KeysOf(const Map& map) {
    std::set<std::string> keys;
    for (const auto& entry : map)
        keys.insert(entry.first);
    return keys;
}

int NumberOf(const json::Value& value) {
    return value.GetType() == json::BoolVal ? static_cast<int>(value.ToBool()) : static_cast<int>(value);
}

int NumberOf(const std::string& cell) {
    return cell == "true" ? 1 : cell == "false" ? 0 : std::stoi(cell);
}

class ConfigurationPage : public testing::Test {
protected:
    void SetUp() override {
        const char* const folder = std::getenv("SCREENSHARE_DEBUG_DIR");
        if (folder == nullptr || !IsOnlyTestOfProcess())
            GTEST_SKIP() << "needs a process and a debug folder of its own: run it through CTest";
        m_file = fs::path(folder) / "share_config.json";
        m_page = ReadWhole(SCREENSHARE_CONFIGURATION_PAGE);
        ASSERT_FALSE(m_page.empty()) << SCREENSHARE_CONFIGURATION_PAGE;
    }

    void ReadAsDebugFile(const std::string& text) {
        std::ofstream(m_file, std::ios::binary) << text;
        fs::permissions(m_file, fs::perms::owner_read | fs::perms::owner_write);
        AppShareConfig::Instance()->UpdateConfig();
    }

    std::string m_page;
    std::map<std::string, Setting> m_settings = KnownSettings();
    CManualClockScope m_clock;

private:
    fs::path m_file;
};

} // namespace

TEST_F(ConfigurationPage, HoldsOneSampleAndItIsAGoodFile) {
    const std::vector<std::string> samples = SamplesOf(m_page);
    ASSERT_EQ(samples.size(), 1u);
    EXPECT_TRUE(AppShareConfig::Instance()->CheckConfig(samples[0].c_str()));
    EXPECT_EQ(json::Deserialize(samples[0]).GetType(), json::ObjectVal);
}

TEST_F(ConfigurationPage, HoldsASampleWhoseEveryKeyIsKnownAndTakesEffect) {
    const std::string sample = SamplesOf(m_page).at(0);
    const json::Value document = json::Deserialize(sample);
    ASSERT_EQ(document.GetType(), json::ObjectVal);
    ASSERT_GT(document.size(), 0u);
    EXPECT_THAT(m_settings, testing::SizeIs(testing::Ge(document.size())));
    std::map<std::string, int> before;
    for (const auto& member : document.ToObject()) {
        ASSERT_EQ(m_settings.count(member.first), 1u) << member.first << " is no key of the reader";
        before[member.first] = m_settings[member.first].stored();
    }
    ReadAsDebugFile(sample);
    for (const auto& member : document.ToObject()) {
        const Setting& setting = m_settings[member.first];
        EXPECT_EQ(setting.stored(), NumberOf(member.second)) << member.first;
        EXPECT_EQ(setting.got(), NumberOf(member.second)) << member.first << " is clamped";
        EXPECT_NE(setting.stored(), before[member.first]) << member.first << " shows a default";
    }
}

TEST_F(ConfigurationPage, ListsEveryKeyOfTheReaderAndNoOther) {
    EXPECT_EQ(KeysOf(RowsOf(m_page)), KeysInSource());
    EXPECT_EQ(KeysOf(m_settings), KeysInSource());
}

TEST_F(ConfigurationPage, TellsTheDefaultOfEveryKey) {
    for (const auto& [key, row] : RowsOf(m_page)) {
        ASSERT_EQ(m_settings.count(key), 1u) << key;
        EXPECT_EQ(m_settings[key].got(), NumberOf(row.normal)) << key;
    }
}

TEST_F(ConfigurationPage, TellsTheTypeOfEveryKey) {
    // Each key is given the other type first, which must change nothing, and then its own.
    std::string wrong;
    std::string right;
    for (const auto& [key, row] : RowsOf(m_page)) {
        ASSERT_EQ(m_settings.count(key), 1u) << key;
        const bool isBool = row.type == "bool";
        const std::string other = m_settings[key].stored() != 0 ? "false" : "true";
        wrong += (wrong.empty() ? "{\"" : ",\"") + key + "\":" + (isBool ? "7" : "true");
        right += (right.empty() ? "{\"" : ",\"") + key + "\":" + (isBool ? other : "54321");
    }
    ReadAsDebugFile(wrong + "}");
    for (const auto& [key, row] : RowsOf(m_page))
        EXPECT_EQ(m_settings[key].stored(), NumberOf(row.normal)) << key;
    ReadAsDebugFile(right + "}");
    for (const auto& [key, row] : RowsOf(m_page))
        EXPECT_EQ(m_settings[key].stored(), row.type == "bool" ? 1 - NumberOf(row.normal) : 54321) << key;
}

TEST_F(ConfigurationPage, TellsTheLowestValueOfEveryKey) {
    std::string text;
    for (const auto& [key, row] : RowsOf(m_page)) {
        if (row.type == "int")
            text += (text.empty() ? "{\"" : ",\"") + key + "\":-9";
    }
    ReadAsDebugFile(text + "}");
    for (const auto& [key, row] : RowsOf(m_page)) {
        if (row.type != "int")
            continue;
        EXPECT_EQ(m_settings[key].got(), row.lowest.empty() ? -9 : NumberOf(row.lowest)) << key;
    }
}
