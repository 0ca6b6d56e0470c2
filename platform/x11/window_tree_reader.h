// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/reply_bytes.h"
#include "platform/x11/server_replies.h"
#include "platform/x11/window_tree_node.h"
#include "platform/x11/x11_connection.h"

#include <xcb/shape.h>
#include <xcb/xcb.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <unordered_map>
#include <utility>
#include <vector>

namespace platform::x11 {

/// Asks the server about the windows of a tree and writes down what it says. All that can be asked at once is
/// asked at once: a round trip costs what dozens of questions cost.
/// Errors: those of X11Connection; what has not been answered is still wanted then.
class WindowTree::Reader {
public:
    explicit Reader(WindowTree& tree);

    /// Without the mark of an earlier connection this is another server, where no window of it is left.
    void RecognizeServer();
    /// Adds the children of the root. Gives the request with which they were asked for.
    unsigned ReadList();
    /// Size, kind and mapping of all windows.
    void ReadBasics();
    void ReadRoot();
    /// Finds out below which child of the root windows are that went out of sight.
    void FollowWanderers();
    /// Whatever is wanted of windows.
    void ReadWindows();

private:
    using Batch = std::span<Node* const>;
    /// Window managers put a client one or two windows deep into its frame.
    static constexpr int DEEPEST_CLIENT = 3;

    struct BasicAnswers;
    struct Search;
    struct LevelAnswers;
    struct Answers;

    /// The answer, without a look at the socket when it is here already.
    template <class Reply>
    Malloced<Reply> Take(Pending<Reply>& pending);
    Pending<xcb_get_property_reply_t> AskProperty(xcb_window_t window, xcb_atom_t atom, std::uint32_t length);
    Pending<xcb_get_property_reply_t> AskWritten(xcb_window_t window, xcb_atom_t atom, std::uint32_t length);
    /// Has everything go out before libxcb holds back so much that it would wait for the server by itself.
    void Pace();
    template <class Work>
    void InBatches(const std::vector<Node*>& nodes, Work work);

    void ReadBasicsOf(Batch batch, bool isFirst);
    BasicAnswers AskBasics(Node& node);
    void ApplyBasics(BasicAnswers& answers, bool isFirst);
    void ApplyShapeExtents(BasicAnswers& answers);
    void PutToSleep(Node& node);
    xcb_pixmap_t WallpaperFrom(const Property& property);

    void FindClients(Batch batch);
    void AskLevel(Search& search);
    void TakeLevel(Search& search);
    void Conclude(const Search& search);
    bool ListenToCandidates(const Search& search);

    void ReadPropertiesOf(Batch batch);
    Answers AskProperties(Node& node);
    void ApplyFirst(Answers& answers);
    void ApplyLater(Answers& answers);
    std::uint32_t MakerOf(xcb_window_t window) const;
    pid_t OwnerFrom(Answers& answers);
    void ApplyShape(Answers& answers);
    void Conclude(Node& node);

    WindowTree& m_tree;
    X11Connection& m_connection;
    unsigned m_unsent = 0;                                               // questions
    std::unordered_map<xcb_window_t, std::vector<xcb_atom_t>> m_written; // which properties a window has
    /// Of the clients that have been asked about: one that has made many windows is asked about once.
    std::unordered_map<std::uint32_t, std::optional<pid_t>> m_pids;
};

template <class Reply>
Malloced<Reply> WindowTree::Reader::Take(Pending<Reply>& pending) {
    const unsigned sequence = pending.Take();
    if (sequence == 0)
        return nullptr;
    bool answered = false;
    void* const reply = m_connection.PollReply(sequence, answered);
    if (answered)
        return WholeReply<Reply>(reply);
    Pending<Reply> again(m_connection.Get(), sequence);
    return m_connection.Await(again);
}

template <class Work>
void WindowTree::Reader::InBatches(const std::vector<Node*>& nodes, Work work) {
    constexpr std::size_t SIZE = 256;
    for (std::size_t first = 0; first < nodes.size(); first += SIZE)
        work(Batch(nodes).subspan(first, std::min(SIZE, nodes.size() - first)));
}

} // namespace platform::x11
