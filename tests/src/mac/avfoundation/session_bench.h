// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/av_foundation_script.h"
#include "platform/platform_life.h"
#include "src/mac/avfoundation/share_capturer_mac_avfoundation.h"
#include "src/mac/avfoundation/share_capturer_mac_avfoundation_cgs_mix.h"
#include "src/mac/share_capturer_context_mac.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/support/engine_bench.h"
#include "tests/support/threads.h"

#include <screenshare/share_capturer.h>

#include <gtest/gtest.h>
#include <linux/futex.h>
#include <sys/syscall.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <ostream>
#include <sstream>
#include <string>
#include <thread>
#include <utility>
#include <vector>

/// One class of back-ends.
struct SessionKind {
    const char* name; ///< What it calls itself in traces.
    std::shared_ptr<ShareCapturerSession> (*make)();

    bool IsMix() const { return std::string(name) == "ShareCapturerAVFoundationCGSMix"; }
};

inline void PrintTo(const SessionKind& kind, std::ostream* out) {
    *out << kind.name;
}

inline std::shared_ptr<ShareCapturerSession> MakeFlatBackEnd() {
    return std::make_shared<ShareCapturerAVFoundation>();
}
inline std::shared_ptr<ShareCapturerSession> MakeMixBackEnd() {
    return std::make_shared<ShareCapturerAVFoundationCGSMix>();
}

inline constexpr SessionKind FLAT_BACK_END{"ShareCapturerAVFoundation", MakeFlatBackEnd};
inline constexpr SessionKind MIX_BACK_END{"ShareCapturerAVFoundationCGSMix", MakeMixBackEnd};

/// Planned failures of sessions in force for the length of a scope.
class CSessionScriptScope {
public:
    CSessionScriptScope() : m_former(platform::ReplaceAVCaptureScript(m_script)) {}
    ~CSessionScriptScope() { platform::ReplaceAVCaptureScript(m_former); }
    CSessionScriptScope(const CSessionScriptScope&) = delete;
    CSessionScriptScope& operator=(const CSessionScriptScope&) = delete;

    platform::AVCaptureScript* operator->() const { return m_script.get(); }

private:
    const std::shared_ptr<platform::AVCaptureScript> m_script = std::make_shared<platform::AVCaptureScript>();
    const std::shared_ptr<platform::AVCaptureScript> m_former;
};

/// Whether a thread waits on a condition, not just for a lock: whoever does has nothing left to do. Its state
/// alone does not tell where the kernel does not say what it sleeps in.
inline bool WaitsForWork(const std::filesystem::path& task, const std::string& state) {
    std::string call; // its number and arguments
    if (!std::getline(std::ifstream(task / "syscall"), call))
        return state.front() == 'S';
    long number = 0;
    unsigned long address = 0;
    unsigned long operation = 0;
    std::istringstream(call) >> number >> std::hex >> address >> operation;
    return number == SYS_futex &&
           (operation & static_cast<unsigned long>(FUTEX_CMD_MASK)) == FUTEX_WAIT_BITSET;
}

/// Of a small file that the kernel makes up.
inline std::string ContentsOf(const std::filesystem::path& file) {
    std::string text(4096, '\0');
    std::ifstream stream(file, std::ios::binary);
    stream.read(text.data(), static_cast<std::streamsize>(text.size()));
    text.resize(static_cast<std::size_t>(stream.gcount()));
    return text;
}

/// A line of the status of a thread, without its name.
inline std::string StatusLine(const std::string& status, const std::string& name) {
    const std::size_t line = status.find("\n" + name + ":\t");
    if (line == std::string::npos)
        return {};
    const std::size_t value = line + name.size() + 3;
    return status.substr(value, status.find('\n', value) - value);
}

/// How often each thread that makes samples or hands them out has gone to sleep; nothing while one is awake.
inline std::optional<std::map<std::string, std::string>> SleepsOfSampleThreads() {
    std::map<std::string, std::string> sleeps;
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        const std::string name = ContentsOf(task.path() / "comm");
        if (name != "scn-sample\n" && name != "scn-dispatch\n")
            continue;
        const std::string status = ContentsOf(task.path() / "status");
        const std::string state = StatusLine(status, "State");
        if (state.empty())
            continue; // it has ended meanwhile
        if (!WaitsForWork(task.path(), state))
            return std::nullopt;
        sleeps[task.path().filename()] = StatusLine(status, "voluntary_ctxt_switches");
    }
    return sleeps;
}

/// On a clock that stands still all samples that are due have reached whom they are for once all those
/// threads sleep at the same time.
inline void AwaitAllSamples() {
    const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
    auto before = SleepsOfSampleThreads();
    for (;;) {
        auto now = SleepsOfSampleThreads();
        if (now && now == before)
            return;
        before = std::move(now);
        ASSERT_LT(std::chrono::steady_clock::now(), deadline);
        std::this_thread::yield();
    }
}

/// A back-end of sessions on a simulated desktop, at ten frames a second on a clock that stands still. At
/// first it shows the main display as it is, and has no sample waiting.
///
/// What tests keep out is pure red, and nothing else has any red.
class SessionBench : public testing::Test {
protected:
    using Lines = std::vector<std::string>;
    using Operation = platform::AVCaptureOperation;
    using DesktopOperation = platform::SimulatedOperation;
    using ms = std::chrono::milliseconds;

    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr pid_t DESKTOP = 5'000'001;
    static constexpr pid_t EDITOR = 5'000'100;
    static constexpr pid_t SECRETS = 5'000'200;
    static constexpr platform::CGWindowID WALLPAPER = 1;
    static constexpr platform::CGWindowID SIDE_WALLPAPER = 2;
    static constexpr platform::CGWindowID TEXT = 3;
    static constexpr platform::CGWindowID SECRET = 4;
    static constexpr std::uint32_t BLACK = 0;
    static constexpr std::uint32_t BLUE = 0x0000FF;
    static constexpr std::uint32_t TEAL = 0x008080;
    static constexpr std::uint32_t RED = 0xFF0000;
    static constexpr std::uint32_t WHITE = 0x00FFFF; // as white as it gets without red
    static constexpr std::uint32_t FILL = 0x009E9E;
    static constexpr int ALL_PIXELS = 200 * 120;
    static constexpr int TEXT_PIXELS = 80 * 40;
    static constexpr int SECRET_PIXELS = 60 * 40;
    static constexpr int TEXT_UNDER_SECRET = 30 * 20;
    static constexpr ms PERIOD{100};

    static constexpr auto OK = static_cast<unsigned>(SHARE_CAPTURE_OK);
    static constexpr auto FAILED = static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    static constexpr auto NO_DATA = static_cast<unsigned>(SHARE_CAPTURE_NO_DATA);
    static constexpr auto DRAGGING = static_cast<unsigned>(SHARE_CAPTURE_DRAGGING);

    /// A text, and a secret over its right bottom corner; a finer display beside.
    static platform::Scene Desk() {
        return platform::Scene()
            .Display(0, 0, 200, 120)
            .Display(200, 10, 100, 50)
            .Scale(2)
            .App(DESKTOP, "Desktop")
            .Window(WALLPAPER)
            .At(0, 0, 200, 120)
            .Colour(BLUE)
            .Level(platform::SIMULATED_LEVEL_DESKTOP)
            .Window(SIDE_WALLPAPER)
            .At(200, 10, 100, 50)
            .Colour(TEAL)
            .Level(platform::SIMULATED_LEVEL_DESKTOP)
            .App(EDITOR, "Editor")
            .Window(TEXT)
            .At(50, 40, 80, 40)
            .Colour(0x00FF00)
            .App(SECRETS, "Secrets")
            .Window(SECRET)
            .At(100, 60, 60, 40)
            .Colour(RED)
            .Pointer(1000, 1000);
    }

    explicit SessionBench(const SessionKind& which) : kind(which) {
        EXPECT_EQ(context->AddSharedDisplay(MAIN), 0);
        EXPECT_TRUE(backEnd->init(context));
    }
    ~SessionBench() override {
        backEnd = nullptr;
        platform::Rest();
    }
    void SetUp() override {
        EXPECT_EQ(backEnd->setFPS(10), 10);
        Tick(); // has the rate come into force
        Show(); // until then others may come
        for (int i = 0; i < 3; ++i)
            Pass();
    }

    // ---- Passes

    unsigned Pass() { return backEnd->captureToIShareFrame(frame.Get()); }
    void Advance(ms time) {
        clock->Advance(time);
        AwaitSamples();
    }
    static void AwaitSamples() { AwaitAllSamples(); }
    /// A frame duration goes by: if anything is new, there is one sample more.
    void Tick() { Advance(PERIOD); }
    /// Passes until there is something, but not for long: what a session that begins gives at first.
    unsigned PassSoon() {
        unsigned code = Pass();
        for (int i = 0; i < 3 && code == NO_DATA; ++i) {
            AwaitSamples();
            code = Pass();
        }
        return code;
    }
    /// Takes what is there, and what comes of asking for it.
    void Drain() {
        for (int i = 0; i < 2; ++i) {
            while (Pass() == OK) {
            }
            AwaitSamples();
        }
    }
    /// Has a new sample come, and passes. The text changes a little.
    unsigned Show() {
        Drain();
        green ^= 1;
        Paint(TEXT, green);
        Tick();
        return Pass();
    }
    /// What is seen of the share has just changed: lets it come to rest.
    void UntilRest() {
        EXPECT_EQ(Pass(), DRAGGING);
        Advance(ms(501));
    }
    void Paint(platform::CGWindowID window, std::uint32_t rgb) {
        EXPECT_TRUE(desktop->SetContent(window, platform::SimulatedContent::Colour(rgb)));
    }
    /// A window in front of all.
    void Open(platform::CGWindowID id, pid_t owner, const platform::CGRect& bounds, std::uint32_t rgb,
              int level = 0) {
        platform::SimulatedWindow window;
        window.info.id = id;
        window.info.owner = owner;
        window.info.frame = bounds;
        window.info.level = level;
        window.content = platform::SimulatedContent::Colour(rgb);
        EXPECT_EQ(desktop->AddWindow(window), id);
    }
    static platform::CGRect Rect(float x, float y, float width, float height) {
        return {{x, y}, {width, height}};
    }

    // ---- What is shared

    /// A share of the desktop but for its secrets.
    void KeepSecretsOut() {
        EXPECT_EQ(context->AddUnSharedApp(static_cast<unsigned>(SECRETS)), 0);
        UntilRest();
        Drain();
    }
    /// A share of the editor alone.
    void ShareEditor() {
        EXPECT_EQ(context->AddSharedApp(static_cast<unsigned>(EDITOR)), 0);
        UntilRest();
        Drain();
    }

    // ---- What came

    FramePixel At(int x, int y) { return PixelAt(*frame.Get(), x, y); }
    int Count(std::uint32_t rgb) { return CountOf(*frame.Get(), rgb); }
    int CountIn(const TVLRect& rect, std::uint32_t rgb) {
        int count = 0;
        for (int y = rect.top; y < rect.bottom; ++y) {
            for (int x = rect.left; x < rect.right; ++x)
                count += At(x, y) == Rgb(rgb) ? 1 : 0;
        }
        return count;
    }
    /// Pixels with any red.
    int CountReddish() {
        const TVLSize size = SizeOf(*frame.Get());
        int count = 0;
        for (int y = 0; y < size.cy; ++y) {
            for (int x = 0; x < size.cx; ++x)
                count += (At(x, y).rgb & 0xFF0000) != 0 ? 1 : 0;
        }
        return count;
    }
    IShareFrame::MetaInfo Meta() { return frame.Get()->GetMetaInfo(); }
    /// A line of the back-end's own.
    std::string OfBackEnd(const std::string& text) const { return Info("[" + std::string(kind.name) + text); }

    const SessionKind kind;
    CManualClockScope clock;
    CSettingsScope settings;
    CSessionScriptScope script;
    CServedScene desktop{Desk()};
    std::shared_ptr<ShareCapturerContextMac> context = std::make_shared<ShareCapturerContextMac>();
    std::shared_ptr<ShareCapturerSession> backEnd = kind.make();
    FrameRef frame = NewFrameRef();
    std::uint32_t green = 0x00FF00; // of the text
};

/// Both classes of back-ends alike.
class SessionBackEnd : public SessionBench, public testing::WithParamInterface<SessionKind> {
protected:
    SessionBackEnd() : SessionBench(GetParam()) {}

    static unsigned Code(int result) { return static_cast<unsigned>(result); }
    std::shared_ptr<ShareCapturerSession> Make() const { return kind.make(); }
    unsigned Starts() const { return script->CallsOf(Operation::StartRunning); }
    /// Has the back-end's session die, and gets the display back.
    void LoseAndFindTheDesktop() {
        desktop->Lose();
        Tick();
        desktop->FindAgain();
    }
};
