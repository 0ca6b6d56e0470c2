// SPDX-License-Identifier: Apache-2.0
#include "tools/explanation_svg.h"

#include "src/mac/share_util_mac.h"
#include "tools/svg_writer.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdio>

namespace {

constexpr int WIDTH = 1040;
constexpr int MARGIN = 20;
constexpr int MAP_WIDTH = WIDTH - 2 * MARGIN;
constexpr int MAP_HEIGHT = 420;
constexpr double MAP_EDGE = 12; // around the monitors of a map
constexpr double LARGEST_SCALE = 4;
constexpr int LINE = 22;

// After Okabe and Ito, whose colours stay apart for the colour-blind.
constexpr const char* BLUE = "#0072B2";
constexpr const char* SKY = "#9AD0F0";
constexpr const char* VERMILION = "#D55E00";
constexpr const char* PEACH = "#F7D7BF";
constexpr const char* ORANGE = "#E69F00";
constexpr const char* CREAM = "#F8E3B3";
constexpr const char* GREY = "#666666";
constexpr const char* PALE = "#E4E4E4";
constexpr const char* WHITE = "#ffffff";

constexpr const char* KEPT_OUT_PAINT = "url(#keptout)";
constexpr const char* OVERLAP_PAINT = "url(#overlap)";
constexpr const char* BACKGROUND_PAINT = "url(#background)";

SvgShape ShapeOf(WindowVerdict verdict) {
    switch (verdict) {
        case WindowVerdict::Kept:
            return {.fill = SKY, .stroke = BLUE, .strokeWidth = 1.5};
        case WindowVerdict::KeptOut:
            return {.fill = KEPT_OUT_PAINT, .stroke = VERMILION, .strokeWidth = 1.5};
        case WindowVerdict::Skipped:
        case WindowVerdict::Missed:
            break;
    }
    return {.fill = PALE, .stroke = GREY, .strokeWidth = 1, .isDashed = true};
}

TVLRect MonitorRect(const ListedMonitor& monitor) {
    return ShareUtilMac::CGRectToTVLRect(monitor.bounds);
}

/// The monitors' place in a map of them.
class MapScale {
public:
    explicit MapScale(const std::vector<ListedMonitor>& monitors) {
        if (monitors.empty())
            return;
        m_box = MonitorRect(monitors.front());
        for (const ListedMonitor& monitor : monitors) {
            const TVLRect rect = MonitorRect(monitor);
            m_box = {std::min(m_box.left, rect.left), std::min(m_box.top, rect.top),
                     std::max(m_box.right, rect.right), std::max(m_box.bottom, rect.bottom)};
        }
        const double width = std::max(1.0, Along(m_box.left, m_box.right));
        const double height = std::max(1.0, Along(m_box.top, m_box.bottom));
        m_scale = std::min(
            {(MAP_WIDTH - 2 * MAP_EDGE) / width, (MAP_HEIGHT - 2 * MAP_EDGE) / height, LARGEST_SCALE});
    }

    SvgRect Of(const TVLRect& rect) const {
        return {MAP_EDGE + Along(m_box.left, rect.left) * m_scale,
                MAP_EDGE + Along(m_box.top, rect.top) * m_scale,
                std::max(0.0, Along(rect.left, rect.right) * m_scale),
                std::max(0.0, Along(rect.top, rect.bottom) * m_scale)};
    }
    int Height() const {
        return CmTruncate(std::ceil(Along(m_box.top, m_box.bottom) * m_scale + 2 * MAP_EDGE));
    }

private:
    static double Along(int from, int to) { return static_cast<double>(to) - static_cast<double>(from); }

    TVLRect m_box{};
    double m_scale = 1;
};

std::string ShortNumber(float value) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%g", static_cast<double>(value));
    return text.data();
}

class ExplanationPicture {
public:
    explicit ExplanationPicture(const Explanation& explanation)
        : m_explanation(explanation),
          m_map(explanation.monitors),
          m_svg(WIDTH, Height()) {}

    std::string Draw() {
        m_svg.AddHatch("keptout", PEACH, "#E8A87C");
        m_svg.AddHatch("overlap", CREAM, ORANGE);
        m_svg.AddDots("background", PALE, "#9A9A9A");
        DrawHeading();
        DrawWindowMap();
        DrawRegionMap();
        DrawTable();
        return m_svg.Finish();
    }

private:
    static constexpr int HEADING = 84;
    static constexpr int MAP_HEADING = 30;

    int Height() const {
        const int lines = 2 + static_cast<int>(m_explanation.windows.size());
        return HEADING + 2 * (MAP_HEADING + m_map.Height() + MARGIN) + lines * LINE + MARGIN;
    }

    // ---- Heading and legend

    void DrawHeading() {
        m_svg.AddText(MARGIN, 32, m_explanation.title, {.size = 20, .isBold = true});
        const std::string keptOut = m_explanation.keptOut.empty() ? "nothing" : m_explanation.keptOut;
        m_svg.AddText(MARGIN, 54, "Asked to keep out: " + ShortenText(keptOut, 110), {.fill = GREY});
        m_y = HEADING;
    }

    /// A swatch with a word; the next one comes behind it.
    void AddToLegend(double& x, const SvgShape& shape, std::string_view word) {
        m_svg.AddRect({x, m_y + 3.0, 26, 14}, shape);
        m_svg.AddText(x + 33, m_y + 15.0, word, {});
        x += 52 + 7.2 * static_cast<double>(word.size());
    }

    void DrawMapHeading(std::string_view heading) {
        m_svg.AddText(MARGIN, m_y + 16.0, heading, {.size = 15, .isBold = true});
    }

    void OpenMap(std::string_view id) {
        m_y += MAP_HEADING;
        m_svg.OpenFrame(id,
                        {MARGIN, static_cast<double>(m_y), MAP_WIDTH, static_cast<double>(m_map.Height())});
    }
    void CloseMap() {
        m_svg.CloseFrame();
        m_y += m_map.Height() + MARGIN;
    }

    // ---- The windows

    void DrawWindowMap() {
        DrawMapHeading("Windows");
        double x = MARGIN + 240;
        AddToLegend(x, ShapeOf(WindowVerdict::Kept), "kept");
        AddToLegend(x, ShapeOf(WindowVerdict::KeptOut), "kept out");
        AddToLegend(x, ShapeOf(WindowVerdict::Skipped), "passed over");
        AddToLegend(x, {.stroke = "#222222", .strokeWidth = 2}, "monitor");
        OpenMap("windows");
        for (std::size_t i = m_explanation.windows.size(); i-- > 0;)
            DrawWindow(i);
        DrawMonitors();
        CloseMap();
    }

    void DrawWindow(std::size_t index) {
        const ExplainedWindow& explained = m_explanation.windows[index];
        const SvgRect rect = RectOf(explained);
        SvgShape shape = ShapeOf(explained.verdict);
        const float alpha = explained.window.kCGWindowAlpha;
        shape.fillOpacity = alpha <= 0 ? 0 : 0.3 + 0.7 * static_cast<double>(alpha);
        shape.isDashed = shape.isDashed || alpha <= 0;
        m_svg.AddRect(rect, shape);
        DrawLabel(index, rect, shape.stroke);
    }

    /// The number that the table has, and as much of the title, or else of the owner's name, as there is room
    /// for.
    void DrawLabel(std::size_t index, const SvgRect& rect, std::string_view colour) {
        const std::string number = std::to_string(index + 1);
        const double badge = 8 + 8.0 * static_cast<double>(number.size());
        m_svg.AddRect({rect.x + 3, rect.y + 3, badge, 16}, {.fill = colour});
        m_svg.AddText(rect.x + 7, rect.y + 15.5, number, {.fill = WHITE, .isBold = true});
        const platform::CGWindowDescription& window = m_explanation.windows[index].window;
        const std::string& title =
            window.kCGWindowName.empty() ? window.kCGWindowOwnerName : window.kCGWindowName;
        const int room = CmTruncate((rect.width - badge - 14) / 7.4);
        if (rect.height >= 20 && !IsCovered(index, {rect.x, rect.y, std::min(rect.width, 160.0), 20}))
            m_svg.AddText(rect.x + badge + 8, rect.y + 15.5, ShortenText(title, room), {});
    }

    /// Half a title behind another window reads worse than none.
    bool IsCovered(std::size_t index, const SvgRect& place) const {
        const auto end = m_explanation.windows.begin() + static_cast<std::ptrdiff_t>(index);
        return std::any_of(m_explanation.windows.begin(), end, [&](const ExplainedWindow& front) {
            const SvgRect rect = RectOf(front);
            return rect.x < place.x + place.width && place.x < rect.x + rect.width &&
                   rect.y < place.y + place.height && place.y < rect.y + rect.height;
        });
    }

    SvgRect RectOf(const ExplainedWindow& explained) const {
        return m_map.Of(ShareUtilMac::CGRectToTVLRect(explained.window.kCGWindowBounds));
    }

    void DrawMonitors() {
        for (const ListedMonitor& monitor : m_explanation.monitors) {
            const SvgRect rect = m_map.Of(MonitorRect(monitor));
            m_svg.AddRect(rect, {.stroke = "#222222", .strokeWidth = 2});
            const bool isShared =
                std::find(m_explanation.sharedMonitors.begin(), m_explanation.sharedMonitors.end(),
                          monitor.id) != m_explanation.sharedMonitors.end();
            const std::string text = std::to_string(monitor.id) + ": " + monitor.name + ", scale " +
                                     ShortNumber(monitor.scale) + (isShared ? "" : ", not shared");
            m_svg.AddText(rect.x + 6, rect.y + rect.height - 7,
                          ShortenText(text, CmTruncate((rect.width - 12) / 7)),
                          {.size = 11, .hasHalo = true});
        }
    }

    // ---- The regions

    void DrawRegionMap() {
        DrawMapHeading("What a viewer gets");
        double x = MARGIN + 240;
        AddToLegend(x, {.fill = SKY, .stroke = BLUE}, "visible");
        AddToLegend(x, {.fill = OVERLAP_PAINT, .stroke = ORANGE}, "overlap: shared, but hidden");
        AddToLegend(x, {.fill = BACKGROUND_PAINT, .stroke = "#9A9A9A"}, "background: not shared");
        OpenMap("regions");
        DrawRegion(m_explanation.background, BACKGROUND_PAINT, PALE);
        DrawRegion(m_explanation.visible, SKY, SKY);
        DrawRegion(m_explanation.overlap, OVERLAP_PAINT, CREAM);
        for (std::size_t i = m_explanation.windows.size(); i-- > 0;) {
            if (m_explanation.windows[i].verdict == WindowVerdict::Kept)
                m_svg.AddRect(RectOf(m_explanation.windows[i]), {.stroke = BLUE, .isDashed = true});
        }
        DrawMonitors();
        CloseMap();
    }

    /// Its rectangles' edges have the region's own colour, so that no gaps show between them.
    void DrawRegion(const std::vector<TVLRect>& rects, std::string_view fill, std::string_view edge) {
        for (const TVLRect& rect : rects)
            m_svg.AddRect(m_map.Of(rect), {.fill = fill, .stroke = edge, .strokeWidth = 1});
    }

    // ---- The table

    struct Column {
        double x;
        int characters;
    };
    static constexpr Column NUMBER{MARGIN, 4};
    static constexpr Column TITLE{MARGIN + 38, 27};
    static constexpr Column APPLICATION{MARGIN + 242, 24};
    static constexpr Column LEVEL{MARGIN + 420, 11};
    static constexpr Column VERDICT{MARGIN + 516, 12};
    static constexpr Column REASON{MARGIN + 628, 53};

    void DrawCell(const Column& column, const std::string& text, bool isBold = false) {
        m_svg.AddText(column.x, m_y + 15.0, ShortenText(text, column.characters), {.isBold = isBold});
    }

    void DrawTable() {
        DrawCell(NUMBER, "No.", true);
        DrawCell(TITLE, "Window (id), front first", true);
        DrawCell(APPLICATION, "Application (pid)", true);
        DrawCell(LEVEL, "Level", true);
        DrawCell(VERDICT, "Verdict", true);
        DrawCell(REASON, "Why", true);
        m_y += LINE;
        for (std::size_t i = 0; i < m_explanation.windows.size(); ++i)
            DrawRow(i);
        if (m_explanation.windows.empty())
            DrawCell(TITLE, "there is no window");
    }

    void DrawRow(std::size_t index) {
        const ExplainedWindow& explained = m_explanation.windows[index];
        const platform::CGWindowDescription& window = explained.window;
        if (index % 2 == 0)
            m_svg.AddRect({MARGIN - 6.0, m_y + 0.0, MAP_WIDTH + 12.0, LINE}, {.fill = "#F3F5F7"});
        DrawCell(NUMBER, std::to_string(index + 1));
        DrawCell(TITLE, NameWithId(window.kCGWindowName, window.kCGWindowNumber, TITLE));
        DrawCell(APPLICATION, NameWithId(window.kCGWindowOwnerName,
                                         static_cast<unsigned>(window.kCGWindowOwnerPID), APPLICATION));
        DrawCell(LEVEL, std::to_string(window.kCGWindowLayer));
        m_svg.AddRect({VERDICT.x, m_y + 5.0, 14, 12}, ShapeOf(explained.verdict));
        m_svg.AddText(VERDICT.x + 20, m_y + 15.0, VerdictText(explained.verdict), {});
        DrawCell(REASON, explained.reason);
        m_y += LINE;
    }

    /// The id stays whole however long the name is.
    static std::string NameWithId(const std::string& name, unsigned id, const Column& column) {
        const std::string idText = " (" + std::to_string(id) + ")";
        const int room = column.characters - static_cast<int>(idText.size());
        return (name.empty() ? "\u2013" : ShortenText(name, room)) + idText;
    }

    const Explanation& m_explanation;
    const MapScale m_map;
    SvgWriter m_svg;
    int m_y = 0;
};

} // namespace

std::string ExplanationSvg(const Explanation& explanation) {
    return ExplanationPicture(explanation).Draw();
}
