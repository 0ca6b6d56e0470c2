// SPDX-License-Identifier: Apache-2.0
#include "bench/compare/driver.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <iostream>
#include <sstream>
#include <stdexcept>
#include <thread>

namespace {

using Clock = std::chrono::steady_clock;

constexpr int FRAMES_BEFORE = 10;
constexpr std::chrono::seconds FRAME_LIMIT{20};

void WaitForFirstFrames(const Driver& driver) {
    const Clock::time_point limit = Clock::now() + FRAME_LIMIT;
    while (driver.Frames() < FRAMES_BEFORE) {
        if (Clock::now() > limit)
            throw std::runtime_error("no frames come");
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

std::string ListOften(Driver& driver, int times) {
    int windows = 0;
    const Clock::time_point start = Clock::now();
    for (int i = 0; i < times; ++i)
        windows = driver.ListWindows();
    const std::chrono::nanoseconds spent = Clock::now() - start;
    return std::to_string(windows) + ' ' + std::to_string(times > 0 ? spent.count() / times : 0);
}

std::string Answer(Driver& driver, const std::string& line) {
    std::istringstream words(line);
    std::string verb;
    words >> verb;
    if (verb == "frames")
        return std::to_string(driver.Frames());
    if (int x = 0, y = 0; verb == "pixel" && words >> x >> y)
        return std::to_string(driver.PixelAt(x, y));
    if (int times = 0; verb == "list" && words >> times)
        return ListOften(driver, times);
    throw std::invalid_argument("no such request: " + line);
}

} // namespace

DriverPlan ReadDriverPlan(int argc, const char* const* argv) {
    DriverPlan plan;
    for (int i = 1; i < argc; ++i) {
        const std::string argument = argv[i];
        const std::size_t end = argument.find('=');
        const std::string name = argument.substr(0, end);
        const std::string value = end != std::string::npos ? argument.substr(end + 1) : "";
        if (name == "--config")
            plan.config = value;
        else if (name == "--window")
            plan.window = static_cast<unsigned>(std::stoul(value));
        else if (name == "--captures")
            plan.captures = std::stoi(value);
        else
            throw std::invalid_argument("no option of a driver: " + argument);
    }
    return plan;
}

void FrameProbe::Saw(const std::uint8_t* pixels, std::ptrdiff_t bytesPerLine, Order order) {
    ++m_frames;
    if (!m_wanted)
        return;
    const std::lock_guard<std::mutex> lock(m_mutex);
    const std::uint8_t* const pixel = pixels + m_y * bytesPerLine + std::ptrdiff_t{4} * m_x;
    const std::uint32_t red = order == Order::RedFirst ? pixel[0] : pixel[2];
    const std::uint32_t blue = order == Order::RedFirst ? pixel[2] : pixel[0];
    m_pixel = red << 16 | static_cast<std::uint32_t>(pixel[1]) << 8 | blue;
    m_wanted = false;
    m_answered.notify_all();
}

std::uint32_t FrameProbe::PixelAt(int x, int y) {
    std::unique_lock<std::mutex> lock(m_mutex);
    m_x = x;
    m_y = y;
    m_wanted = true;
    if (!m_answered.wait_for(lock, FRAME_LIMIT, [this] { return !m_wanted; }))
        throw std::runtime_error("no frame comes");
    return m_pixel;
}

int RunDriver(int argc, const char* const* argv,
              const std::function<std::unique_ptr<Driver>(const DriverPlan&)>& start) {
    try {
        const DriverPlan plan = ReadDriverPlan(argc, argv);
        const std::unique_ptr<Driver> driver = start(plan);
        if (plan.captures > 0)
            WaitForFirstFrames(*driver);
        std::cout << "ready" << std::endl;
        for (std::string line; std::getline(std::cin, line);)
            std::cout << Answer(*driver, line) << std::endl;
        return EXIT_SUCCESS;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "%s: %s\n", argv[0], failure.what());
        return EXIT_FAILURE;
    }
}
