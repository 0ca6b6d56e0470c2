// SPDX-License-Identifier: Apache-2.0
#include "tools/list_watch.h"
#include "tests/src/mac/backend_tools.h"
#include "tests/tool/output_pipe.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <unistd.h>

#include <csignal>
#include <functional>
#include <string>
#include <thread>
#include <vector>

using namespace platform;

namespace {

using Lines = std::vector<std::string>;

/// A watched desktop; what happens there, and who reads of it, has a thread of its own.
class WatchedList : public testing::Test {
protected:
    WatchedList() {
        // Whatever thread there will be, only the watch is to hear of them.
        sigemptyset(&m_signals);
        sigaddset(&m_signals, SIGINT);
        sigaddset(&m_signals, SIGTERM);
        pthread_sigmask(SIG_BLOCK, &m_signals, nullptr);
    }
    ~WatchedList() override {
        // They stay pending, since nobody takes them.
        const timespec noTime{};
        while (sigtimedwait(&m_signals, nullptr, &noTime) > 0) {
        }
    }

    static WriteResult Watch(const ListKind& list, ListForm form,
                             const std::function<void(OutputPipe& output)>& story) {
        OutputPipe output;
        std::thread teller([&] { story(output); });
        WriteResult result = WatchList(list, form);
        teller.join();
        return result;
    }

    CServedScene m_desktop{Scene().Display(0, 0, 200, 120).App(1001, "Editor").Window(1).Titled("One")};

private:
    sigset_t m_signals{};
};

} // namespace

TEST_F(WatchedList, TellsWhatComesChangesAndGoes) {
    Lines lines;
    const WriteResult result = Watch(ListOfWindows(), ListForm::Json, [&](OutputPipe& output) {
        lines.push_back(output.ReadLine());
        m_desktop->SetTitle(1, "Two");
        lines.push_back(output.ReadLine());
        m_desktop->CloseWindow(1);
        lines.push_back(output.ReadLine());
        kill(getpid(), SIGTERM);
    });
    EXPECT_FALSE(result) << result->text;
    EXPECT_EQ(lines[0].rfind("{\"change\": \"added\", \"id\": 1, ", 0), 0u) << lines[0];
    EXPECT_EQ(lines[1].rfind("{\"change\": \"changed\", \"id\": 1, ", 0), 0u) << lines[1];
    EXPECT_NE(lines[1].find("\"title\": \"Two\""), std::string::npos) << lines[1];
    EXPECT_EQ(lines[2].rfind("{\"change\": \"removed\", \"id\": 1, ", 0), 0u) << lines[2];
}

TEST_F(WatchedList, OutlivesTheDesktop) {
    Lines lines;
    const WriteResult result = Watch(ListOfApplications(), ListForm::Table, [&](OutputPipe& output) {
        lines.push_back(output.ReadLine());
        lines.push_back(output.ReadLine());
        m_desktop->Lose();
        lines.push_back(output.ReadLine());
        m_desktop->FindAgain();
        lines.push_back(output.ReadLine());
        kill(getpid(), SIGINT);
    });
    EXPECT_FALSE(result) << result->text;
    EXPECT_EQ(lines, (Lines{"   PID   NAME    WINDOWS", "+  1001  Editor  1", "-  1001  Editor  1",
                            "+  1001  Editor  1"}));
}

TEST_F(WatchedList, EndsWithItsReader) {
    const WriteResult result = Watch(ListOfMonitors(), ListForm::Table, [](OutputPipe& output) {
        output.ReadLine();
        output.CloseReader();
    });
    ASSERT_TRUE(result);
    EXPECT_EQ(result->code, EXIT_CODE_READER_GONE);
    EXPECT_EQ(result->text, "the reader of standard output has closed the pipe");
}
