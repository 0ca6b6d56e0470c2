// SPDX-License-Identifier: Apache-2.0
#include "tools/list_watch.h"

#include "tools/list_changes.h"

#include <poll.h>

#include <array>
#include <cerrno>

namespace {

/// People see what happens at once; a look costs next to nothing.
constexpr int LOOK_EVERY_MS = 200;

class ListWatch {
public:
    ListWatch(const ListKind& list, ListForm form) : m_list(list), m_form(form), m_table(list.headings) {}

    WriteResult Run();

private:
    WriteResult TellChanges();
    WriteResult WaitForNextLook() const;

    const ListKind& m_list;
    const ListForm m_form;
    const StopSignals m_signals;
    CaptureOutput m_output{m_signals};
    ListHistory m_history;
    ListChangeTable m_table;
};

WriteResult ListWatch::Run() {
    WriteResult failure = m_output.Open("-");
    while (!failure && !m_signals.IsRaised()) {
        failure = TellChanges();
        if (!failure)
            failure = WaitForNextLook();
    }
    // Whoever stops it may well have stopped its reader, too.
    return m_signals.IsRaised() ? std::nullopt : failure;
}

WriteResult ListWatch::TellChanges() {
    const std::vector<ListChange> changes = m_history.Follow(m_list.look());
    const std::string text = m_form == ListForm::Json ? ListChangeJson(changes) : m_table.Text(changes);
    return m_output.Write(text.data(), text.size());
}

WriteResult ListWatch::WaitForNextLook() const {
    // A negative descriptor is one that poll passes over.
    std::array<pollfd, 2> descriptors{
        {{m_signals.Descriptor(), POLLIN, 0}, {m_output.PipeDescriptor(), 0, 0}}};
    poll(descriptors.data(), descriptors.size(), LOOK_EVERY_MS);
    if (descriptors[1].revents != 0)
        return FailureFromErrno("standard output", EPIPE);
    return std::nullopt;
}

} // namespace

WriteResult WatchList(const ListKind& list, ListForm form) {
    return ListWatch(list, form).Run();
}
