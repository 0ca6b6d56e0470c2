// SPDX-License-Identifier: Apache-2.0
//
// A complete client of the library. It brings a capturer of its own (screen_capturer.h), which grabs a real X
// screen, and a sink (png_sink.h), which writes what it gets as PNG files. RunEngine below is the whole order
// of calls.

#include "commands.h"
#include "console.h"
#include "options.h"
#include "png_sink.h"
#include "screen_capturer.h"

#include <fcntl.h>
#include <screenshare/share_engine.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>

namespace {

int Fail(const std::string& problem, int exitCode = 1) {
    std::fprintf(stderr, "external_capturer: %s\n", problem.c_str());
    return exitCode;
}

// Started with standard input closed, the next descriptor opened would take its number and be read for
// commands.
void OccupyStandardStreams() {
    int fd = 0;
    while (fd >= 0 && fd <= STDERR_FILENO) {
        fd = open("/dev/null", O_RDWR | O_CLOEXEC);
    }
    close(fd);
}

int Probe(X11Grabber& grabber) {
    if (grabber.IsFrontOfWayland()) {
        return Fail("display \"" + grabber.GetDisplayName() +
                    "\" only fronts a Wayland session: its pictures would be black");
    }
    X11Picture picture{};
    if (!grabber.Grab(picture)) {
        return Fail("display \"" + grabber.GetDisplayName() + "\" refuses to be captured");
    }
    std::printf("display \"%s\" can be captured: %dx%d, %s\n", grabber.GetDisplayName().c_str(),
                picture.width, picture.height,
                grabber.UsesSharedMemory() ? "through shared memory" : "without shared memory");
    return 0;
}

bool MakeDirectory(const std::string& directory, std::string& problem) {
    std::error_code error;
    std::filesystem::create_directories(directory, error);
    if (error) {
        problem = "cannot make folder " + directory + ": " + error.message();
        return false;
    }
    if (access(directory.c_str(), W_OK | X_OK) != 0) {
        problem = "cannot write into folder " + directory;
        return false;
    }
    return true;
}

void SetUp(IShareCaptureEngine& engine, const Options& options, ScreenCapturer& capturer, PngSink& sink) {
    engine.SetExternalIShareCapturer(&capturer);
    // Nobody draws a pointer here: without this, the engine would miss one in every frame.
    engine.EnableExternalISharePointing(true);
    engine.SetSink(&sink);
    engine.SetCaptureFps(static_cast<unsigned>(options.fps));
    bool checkDuplicates = options.checkDuplicates;
    engine.Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &checkDuplicates, sizeof(checkDuplicates));
}

// What the engine was lent is taken back before it ends.
void TakeDown(IShareCaptureEngine& engine) {
    engine.SetSink(nullptr);
    engine.SetExternalIShareCapturer(nullptr);
    DestroyShareCaptureEngine(&engine);
}

int RunEngine(const Options& options, X11Grabber& grabber) {
    ScreenCapturer capturer(grabber);
    PngSink sink(options.directory, options.every, options.frames);
    Console console;

    UseShareLib();
    EnableScreenShareDump(options.dump);
    // An engine makes its pointing object before it reads the debug file. One that goes ahead has read it,
    // and the next one gets the dummy pointer that the file may ask for.
    DestroyShareCaptureEngine(CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION));
    IShareCaptureEngine* engine = CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
    if (engine == nullptr) {
        ReleaseShareLib();
        return Fail("no engine of this kind");
    }
    SetUp(*engine, options, capturer, sink);
    const int started = engine->Start();
    if (started == SHARE_RESULT_OK) {
        console.Run(*engine, sink.GetEndFd(), std::chrono::seconds(options.seconds));
        // Stop forgets the statistics. With the sink closed they speak of the very pictures that it wrote.
        sink.Close();
        PrintStatistics(*engine);
        engine->Stop();
    }
    TakeDown(*engine);
    ReleaseShareLib();

    if (started != SHARE_RESULT_OK) {
        return Fail("the engine does not start: " + std::to_string(started));
    }
    std::printf("%d PNG files in %s\n", sink.GetFileCount(), sink.GetDirectory().c_str());
    return sink.HasFailed() ? 1 : 0;
}

} // namespace

int main(int argc, char** argv) {
    OccupyStandardStreams();
    // Whoever reads along through a pipe sees each line when it is printed.
    std::setvbuf(stdout, nullptr, _IOLBF, BUFSIZ);

    Options options;
    std::string problem;
    if (!ParseOptions(argc, argv, options, problem)) {
        return Fail(problem, 2);
    }
    if (options.help) {
        std::fputs(usageText, stdout);
        return 0;
    }
    const auto grabber = X11Grabber::Open(options.display, problem);
    if (!grabber) {
        return Fail(problem);
    }
    if (options.probe) {
        return Probe(*grabber);
    }
    if (!MakeDirectory(options.directory, problem)) {
        return Fail(problem);
    }
    return RunEngine(options, *grabber);
}
