// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_tree_reader.h"

#include <algorithm>

/// The search for the clients inside frames.
namespace platform::x11 {

namespace {

/// Further windows below a child of the root are not looked at.
constexpr std::size_t MOST_SEARCHED = 128;
constexpr std::uint32_t STATE_LENGTH = 2;
constexpr std::uint32_t WITHDRAWN = 0;

std::vector<xcb_atom_t> SortedAtomsFrom(const xcb_list_properties_reply_t& reply) {
    std::vector<xcb_atom_t> atoms = AtomsFrom(reply);
    std::sort(atoms.begin(), atoms.end());
    return atoms;
}

} // namespace

struct WindowTree::Reader::LevelAnswers {
    xcb_window_t window = 0;
    Pending<xcb_get_property_reply_t> state;
    Pending<xcb_get_window_attributes_reply_t> attributes;
    Pending<xcb_query_tree_reply_t> tree;
    Pending<xcb_list_properties_reply_t> properties;
};

struct WindowTree::Reader::Search {
    explicit Search(Node& searched) : node(&searched), level{searched.window} {}

    Node* node;
    int depth = 0;
    std::vector<xcb_window_t> level; // to be looked at, the rearmost first
    std::vector<LevelAnswers> answers;
    std::vector<xcb_window_t> seen;
    xcb_window_t carrier = 0; // of WM_STATE
    bool carrierMapped = false;
    bool managed = false;
};

void WindowTree::Reader::FindClients(Batch batch) {
    std::vector<Search> searches;
    for (Node* const node : batch) {
        if (!node->asleep && (node->wants & WantClient) != 0)
            searches.emplace_back(*node);
    }
    bool goesOn = !searches.empty();
    while (goesOn) {
        for (Search& search : searches)
            AskLevel(search);
        goesOn = false;
        for (Search& search : searches) {
            TakeLevel(search);
            goesOn = goesOn || !search.level.empty();
        }
    }
    for (const Search& search : searches)
        Conclude(search);
}

void WindowTree::Reader::AskLevel(Search& search) {
    xcb_connection_t* const connection = m_connection.Get();
    for (const xcb_window_t window : search.level) {
        LevelAnswers& answers = search.answers.emplace_back();
        answers.window = window;
        answers.state = AskProperty(window, m_connection.Atom(AtomName::WM_STATE), STATE_LENGTH);
        if (search.depth > 0)
            answers.attributes = m_connection.Ask<xcb_get_window_attributes_reply_t>(
                xcb_get_window_attributes(connection, window));
        else
            answers.properties =
                m_connection.Ask<xcb_list_properties_reply_t>(xcb_list_properties(connection, window));
        if (search.depth < DEEPEST_CLIENT)
            answers.tree = m_connection.Ask<xcb_query_tree_reply_t>(xcb_query_tree(connection, window));
    }
    search.level.clear();
}

void WindowTree::Reader::TakeLevel(Search& search) {
    std::vector<xcb_window_t> below;
    for (LevelAnswers& answers : search.answers) {
        search.seen.push_back(answers.window);
        const Property state = Property::From(Take(answers.state).get());
        const auto attributes = Take(answers.attributes);
        if (const auto properties = Take(answers.properties))
            m_written[answers.window] = SortedAtomsFrom(*properties);
        const auto tree = Take(answers.tree);
        if (tree != nullptr) {
            const std::vector<xcb_window_t> children = ChildrenFrom(*tree);
            below.insert(below.end(), children.begin(), children.end());
        }
        const bool mapped = attributes != nullptr && attributes->map_state != XCB_MAP_STATE_UNMAPPED;
        if (!state.IsThere() || (search.carrierMapped && !mapped))
            continue;
        search.carrier = answers.window;
        search.carrierMapped = mapped;
        search.managed = state.FirstWord() != WITHDRAWN;
    }
    search.answers.clear();
    ++search.depth;
    if (search.carrier != 0)
        return;
    const std::size_t rest = MOST_SEARCHED - std::min(MOST_SEARCHED, search.seen.size());
    const std::size_t count = std::min(below.size(), rest);
    search.level.assign(below.end() - static_cast<std::ptrdiff_t>(count), below.end());
}

/// A client is marked as one after it was put into its frame, and only who listens to it hears of the mark.
/// True when some were not listened to yet: they may have got it since we looked.
bool WindowTree::Reader::ListenToCandidates(const Search& search) {
    constexpr std::uint32_t MASK = XCB_EVENT_MASK_PROPERTY_CHANGE;
    Node& node = *search.node;
    bool isAnyNew = false;
    for (const xcb_window_t window : search.seen) {
        if (window == node.window || node.inside.count(window) != 0 || !node.candidates.insert(window).second)
            continue;
        Pace();
        xcb_change_window_attributes(m_connection.Get(), window, XCB_CW_EVENT_MASK, &MASK);
        isAnyNew = true;
    }
    return isAnyNew;
}

void WindowTree::Reader::Conclude(const Search& search) {
    Node& node = *search.node;
    if (search.carrier == 0 && ListenToCandidates(search))
        return; // it is searched once more
    if (search.carrier != 0)
        node.candidates.clear();
    const auto isSeen = [&search](xcb_window_t window) {
        return std::find(search.seen.begin(), search.seen.end(), window) != search.seen.end();
    };
    xcb_window_t client = search.carrier;
    for (const xcb_window_t each : node.inside) {
        if (client == 0 && isSeen(each))
            client = each; // its window manager is about to take it into its care
        else if (each != client && !isSeen(each))
            m_tree.m_wandering.insert(each);
    }
    if (client == 0)
        client = node.window;
    node.wants &= ~unsigned{WantClient};
    if (client != node.window)
        m_tree.Adopt(node, client); // when it is new there we look again, now that we hear of it
    if (node.managed != search.managed)
        m_tree.NoteStackChange();
    node.managed = search.managed;
    m_tree.SetClient(node, client);
    if (!node.mapped && !node.managed && (node.wants & WantClient) == 0)
        PutToSleep(node);
}

} // namespace platform::x11
