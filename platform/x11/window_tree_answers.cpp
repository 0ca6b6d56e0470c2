// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_tree_reader.h"

#include <xcb/res.h>

#include <algorithm>

/// What clients have written on their windows.
namespace platform::x11 {

namespace {

/// More edges than any window needs are a reason to show nothing of it.
constexpr std::size_t MOST_SHAPE_RECTS = 16384;
/// Broader shadows are none.
constexpr int BROADEST_SHADOW = 256;

constexpr std::uint32_t TEXT = LONGEST_TEXT;
constexpr std::uint32_t LIST = LONGEST_LIST;
constexpr std::uint32_t STRUT_LENGTH = 12;

PixelRect United(const PixelRect& one, const PixelRect& other) {
    return {std::min(one.left, other.left), std::min(one.top, other.top), std::max(one.right, other.right),
            std::max(one.bottom, other.bottom)};
}

} // namespace

struct WindowTree::Reader::Answers {
    using PropertyAnswer = Pending<xcb_get_property_reply_t>;

    Node* node = nullptr;
    unsigned asked = 0;
    Pending<xcb_shape_get_rectangles_reply_t> shape;
    PropertyAnswer pid;
    PropertyAnswer machine;
    Pending<xcb_res_query_client_ids_reply_t> knownPid;
    PropertyAnswer state;
    PropertyAnswer desktop;
    PropertyAnswer type;
    PropertyAnswer frameOpacity;
    PropertyAnswer opacity;
    PropertyAnswer shadow;
    PropertyAnswer utf8Name;
    PropertyAnswer name;
    PropertyAnswer windowClass;
    PropertyAnswer partialStrut;
    PropertyAnswer strut;
};

void WindowTree::Reader::ReadWindows() {
    std::vector<Node*> nodes;
    for (const xcb_window_t window : m_tree.m_toAsk)
        nodes.push_back(m_tree.NodeOf(window));
    InBatches(nodes, [this](Batch batch) {
        ReadBasicsOf(batch, false);
        FindClients(batch);
        ReadPropertiesOf(batch);
        m_written.clear();
    });
}

/// Nothing is asked about what a window is known not to have, which is most of it with most windows.
Pending<xcb_get_property_reply_t> WindowTree::Reader::AskWritten(xcb_window_t window, xcb_atom_t atom,
                                                                 std::uint32_t length) {
    const auto written = m_written.find(window);
    if (written != m_written.end() &&
        !std::binary_search(written->second.begin(), written->second.end(), atom))
        return {};
    return AskProperty(window, atom, length);
}

void WindowTree::Reader::ReadPropertiesOf(Batch batch) {
    std::vector<Answers> answers;
    answers.reserve(batch.size());
    for (Node* const node : batch) {
        if (!node->asleep && (node->wants & WantClient) == 0)
            answers.push_back(AskProperties(*node));
    }
    for (Answers& each : answers) {
        ApplyFirst(each);
        ApplyLater(each);
        each.node->wants &= ~each.asked;
        Conclude(*each.node);
    }
}

/// The order is that in which the answers are taken: libxcb looks for them from the oldest on.
WindowTree::Reader::Answers WindowTree::Reader::AskProperties(Node& node) {
    xcb_connection_t* const connection = m_connection.Get();
    const xcb_window_t client = node.client;
    Answers answers;
    answers.node = &node;
    answers.asked = node.wants;
    const auto wants = [&node](unsigned what) { return (node.wants & what) != 0; };
    const auto ask = [&](AtomName name, std::uint32_t length) {
        return AskWritten(client, m_connection.Atom(name), length);
    };
    if (wants(WantShape))
        answers.shape = m_connection.Ask<xcb_shape_get_rectangles_reply_t>(
            xcb_shape_get_rectangles(connection, node.window, XCB_SHAPE_SK_BOUNDING));
    if (wants(WantOwner)) {
        answers.pid = ask(AtomName::NET_WM_PID, 1);
        answers.machine = AskWritten(client, XCB_ATOM_WM_CLIENT_MACHINE, TEXT);
        if (m_connection.Has().xres && m_pids.emplace(MakerOf(client), std::nullopt).second) {
            const xcb_res_client_id_spec_t spec{client, XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID};
            answers.knownPid = m_connection.Ask<xcb_res_query_client_ids_reply_t>(
                xcb_res_query_client_ids(connection, 1, &spec));
        }
    }
    if (wants(WantState))
        answers.state = ask(AtomName::NET_WM_STATE, LIST);
    if (wants(WantDesktop))
        answers.desktop = ask(AtomName::NET_WM_DESKTOP, 1);
    if (wants(WantType))
        answers.type = ask(AtomName::NET_WM_WINDOW_TYPE, LIST);
    if (wants(WantOpacity) && client != node.window)
        answers.frameOpacity =
            AskProperty(node.window, m_connection.Atom(AtomName::NET_WM_WINDOW_OPACITY), 1);
    if (wants(WantOpacity))
        answers.opacity = ask(AtomName::NET_WM_WINDOW_OPACITY, 1);
    if (wants(WantShadow))
        answers.shadow = ask(AtomName::GTK_FRAME_EXTENTS, 4);
    if (wants(WantTitle)) {
        answers.utf8Name = ask(AtomName::WM_NAME_UTF8, TEXT);
        answers.name = AskWritten(client, XCB_ATOM_WM_NAME, TEXT);
    }
    if (wants(WantClass))
        answers.windowClass = AskWritten(client, XCB_ATOM_WM_CLASS, TEXT);
    if (wants(WantStrut)) {
        answers.partialStrut = ask(AtomName::NET_WM_STRUT_PARTIAL, STRUT_LENGTH);
        answers.strut = ask(AtomName::NET_WM_STRUT, 4);
    }
    return answers;
}

void WindowTree::Reader::ApplyFirst(Answers& answers) {
    Node& node = *answers.node;
    const auto asked = [&answers](unsigned what) { return (answers.asked & what) != 0; };
    const auto read = [this](auto& pending) { return Property::From(Take(pending).get()); };
    if (asked(WantShape))
        ApplyShape(answers);
    if (asked(WantOwner))
        node.owner = OwnerFrom(answers);
    if (asked(WantState)) {
        const Property state = read(answers.state);
        node.hidden = state.Names(m_connection.Atom(AtomName::NET_WM_STATE_HIDDEN));
        node.above = state.Names(m_connection.Atom(AtomName::NET_WM_STATE_ABOVE));
    }
    if (asked(WantDesktop)) {
        const std::vector<std::uint32_t> desktop = read(answers.desktop).Cardinals();
        node.desktop = desktop.empty() ? std::nullopt : std::optional<std::uint32_t>(desktop[0]);
        m_tree.PlaceOnDesktop(node);
    }
    if (asked(WantType))
        node.type = TypeFrom(read(answers.type), m_tree.m_types);
    if (asked(WantOpacity)) {
        const Property ofFrame = read(answers.frameOpacity);
        const Property ofClient = read(answers.opacity);
        node.opacity = OpacityFrom(ofFrame.IsThere() ? ofFrame : ofClient);
    }
    if (asked(WantShadow))
        node.shadow = EdgesFrom(read(answers.shadow), BROADEST_SHADOW);
    ++m_tree.m_revision;
}

void WindowTree::Reader::ApplyLater(Answers& answers) {
    Node& node = *answers.node;
    const auto asked = [&answers](unsigned what) { return (answers.asked & what) != 0; };
    const auto read = [this](auto& pending) { return Property::From(Take(pending).get()); };
    if (asked(WantTitle)) {
        const Property utf8Name = read(answers.utf8Name);
        const Property name = read(answers.name);
        node.title = TitleFrom(utf8Name, name, m_connection.Atom(AtomName::UTF8_STRING));
    }
    if (asked(WantClass))
        node.windowClass = ClassFrom(read(answers.windowClass));
    if (asked(WantStrut)) {
        const Property partial = read(answers.partialStrut);
        const Property whole = read(answers.strut);
        node.strut = StrutFrom(partial, whole, m_tree.m_rootWidth, m_tree.m_rootHeight);
    }
}

/// The client that has made a window, by the part of the name that the server gives each client.
std::uint32_t WindowTree::Reader::MakerOf(xcb_window_t window) const {
    return window & ~m_connection.Setup().resource_id_mask;
}

pid_t WindowTree::Reader::OwnerFrom(Answers& answers) {
    OwnerClaims claims;
    claims.written = PidFrom(Property::From(Take(answers.pid).get()));
    claims.isOtherMachine = IsOtherMachine(Property::From(Take(answers.machine).get()), m_tree.m_host);
    std::optional<pid_t>& known = m_pids[MakerOf(answers.node->client)];
    if (const auto reply = Take(answers.knownPid))
        known = PidFromClientIds(BytesBehind(*reply));
    claims.known = known;
    return x11::OwnerFrom(claims, m_tree.m_ourselves);
}

void WindowTree::Reader::ApplyShape(Answers& answers) {
    Node& node = *answers.node;
    node.shape.clear();
    node.shapeBounds = {};
    const auto reply = Take(answers.shape);
    if (reply == nullptr)
        return;
    const std::vector<xcb_rectangle_t> rectangles = RectanglesFrom(*reply);
    if (rectangles.size() > MOST_SHAPE_RECTS)
        return;
    for (const xcb_rectangle_t& each : rectangles) {
        const int left = each.x + node.border;
        const int top = each.y + node.border;
        node.shape.push_back({left, top, left + each.width, top + each.height});
        node.shapeBounds =
            node.shape.size() == 1 ? node.shape.back() : United(node.shapeBounds, node.shape.back());
    }
}

/// Everything that was wanted of it has been read.
void WindowTree::Reader::Conclude(Node& node) {
    if (node.wants == 0)
        m_tree.m_toAsk.erase(node.window);
    node.known = (node.wants & WantFirst) == 0;
    const bool isFirst = node.id == 0;
    if (!node.known || node.inputOnly || (isFirst && !node.mapped && !node.managed))
        return;
    WindowIds& ids = m_tree.m_memory.windowIds;
    // Between two connections another process may have come to a window of the same name.
    if (m_tree.m_recalling && isFirst && (node.owner == 0 || ids.OwnerOf(node.client) != node.owner))
        ids.Release(node.client);
    node.id = ids.Claim(node.client, node.owner, node.owner == m_tree.m_ourselves);
}

} // namespace platform::x11
