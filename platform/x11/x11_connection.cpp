// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_connection.h"

#include "platform/x11/x11_failure.h"
#include "platform/x11/x11_patience.h"

#include <poll.h>
#include <xcb/composite.h>
#include <xcb/damage.h>
#include <xcb/randr.h>
#include <xcb/res.h>
#include <xcb/shape.h>
#include <xcb/shm.h>
#include <xcb/xc_misc.h>
#include <xcb/xcbext.h>
#include <xcb/xfixes.h>
#include <xcb/xinput.h>

#include <algorithm>
#include <string>
#include <thread>
#include <vector>

namespace platform::x11 {

namespace {

const xcb_screen_t* FindScreen(xcb_connection_t* connection, int number) {
    xcb_screen_iterator_t screens = xcb_setup_roots_iterator(xcb_get_setup(connection));
    for (; number > 0; --number)
        xcb_screen_next(&screens);
    return screens.data;
}

/// Whether a version is at least another one.
template <class Reply>
bool IsAtLeast(const Malloced<Reply>& reply, unsigned major, unsigned minor) {
    return reply != nullptr &&
           (reply->major_version > major || (reply->major_version == major && reply->minor_version >= minor));
}

} // namespace

X11Connection::X11Connection(Link link, int wakes)
    : m_connection(std::move(link.connection)),
      m_screenNumber(link.screen),
      m_wakes(wakes),
      m_screen(FindScreen(m_connection.get(), m_screenNumber)) {
    const xcb_setup_t& setup = *xcb_get_setup(m_connection.get());
    m_nextId = setup.resource_id_base;
    m_lastId = setup.resource_id_base | setup.resource_id_mask;
    m_idStep = setup.resource_id_mask & (~setup.resource_id_mask + 1);
}

// ---- Waiting

void* X11Connection::PollReply(unsigned sequence, bool& answered) {
    void* reply = nullptr;
    xcb_generic_error_t* error = nullptr;
    answered = xcb_poll_for_reply(m_connection.get(), sequence, &reply, &error) != 0;
    std::free(error);
    if (reply == nullptr)
        Check();
    return reply;
}

void* X11Connection::AwaitReply(unsigned sequence) {
    Check();
    if (sequence == 0)
        return nullptr;
    // Whoever goes away without the reply doesn't want it.
    Pending<void> pending(m_connection.get(), sequence);
    Patience patience(m_deadline, m_wakes);
    bool sent = m_mayHoldRequests;
    Flush();
    for (;; sent = true) {
        bool answered = false;
        void* const reply = PollReply(sequence, answered);
        if (answered) {
            pending.Take();
            return reply;
        }
        if (!sent) // of requests that went out together, the first answer has mostly brought the others
            Send();
        if (patience.WaitFor(Descriptor(), POLLIN) != Patience::Outcome::Ready)
            throw Unanswered();
    }
}

void X11Connection::RoundTrip() {
    Fetch<xcb_get_input_focus_reply_t>(xcb_get_input_focus(Get()));
}

/// xcb itself waits without end for a server that takes nothing in. So it is given only what there is room
/// for: a socket that can be written to at all takes more than xcb holds back.
void X11Connection::Send() {
    Patience patience(m_deadline, m_wakes);
    if (patience.WaitFor(Descriptor(), POLLOUT) != Patience::Outcome::Ready)
        throw Unanswered();
    xcb_flush(m_connection.get());
    m_mayHoldRequests = false;
    Check();
}

void X11Connection::Flush() {
    if (m_mayHoldRequests)
        Send();
}

void X11Connection::LetAnswersGather(std::size_t bytes) {
    using namespace std::chrono_literals;
    constexpr std::size_t BYTES_PER_NANOSECOND = 8; // that a server copies
    constexpr std::size_t MANY_BYTES = std::size_t{256} << 10U;
    Flush();
    if (bytes < MANY_BYTES)
        return;
    std::this_thread::sleep_for(250us + std::chrono::nanoseconds(bytes / BYTES_PER_NANOSECOND));
}

Event X11Connection::NextEvent() {
    for (;;) {
        Event event(xcb_poll_for_event(m_connection.get()));
        if (event == nullptr)
            Check();
        if (event == nullptr || event->response_type != 0)
            return event;
    }
}

Event X11Connection::NextQueuedEvent() {
    for (;;) {
        Event event(xcb_poll_for_queued_event(m_connection.get()));
        if (event == nullptr || event->response_type != 0)
            return event;
    }
}

void X11Connection::Check() const {
    if (xcb_connection_has_error(m_connection.get()) != 0)
        throw Lost();
}

int X11Connection::Descriptor() const {
    return xcb_get_file_descriptor(m_connection.get());
}

// ---- Ids

std::uint32_t X11Connection::NewId() {
    if (m_nextId == 0)
        AskForFreeIds();
    const std::uint32_t id = m_nextId;
    m_nextId = m_lastId - id < m_idStep ? 0 : id + m_idStep;
    return id;
}

/// All of ours have been given out once: the server knows which are free again.
void X11Connection::AskForFreeIds() {
    Malloced<xcb_xc_misc_get_xid_range_reply_t> range;
    if (xcb_get_extension_data(Get(), &xcb_xc_misc_id)->present != 0)
        range = Fetch<xcb_xc_misc_get_xid_range_reply_t>(xcb_xc_misc_get_xid_range(Get()));
    const xcb_setup_t& setup = *xcb_get_setup(Get());
    // A server that has none tells of the one id 0.
    if (range == nullptr || range->count == 0 ||
        (range->start_id & ~setup.resource_id_mask) != setup.resource_id_base)
        throw Lost();
    const std::uint64_t last = range->start_id + (std::uint64_t{range->count} - 1) * m_idStep;
    const std::uint32_t highest = setup.resource_id_base | setup.resource_id_mask;
    m_nextId = range->start_id;
    m_lastId = static_cast<std::uint32_t>(std::min<std::uint64_t>(last, highest));
}

// ---- Introduction

void X11Connection::Introduce() {
    LookUpExtensions();
    LookUpVersions();
    LookUpAtoms();
}

/// xcb looks an extension up when it is first used, and waits without end for the answer. So all of the
/// answers are brought here first.
void X11Connection::LookUpExtensions() {
    xcb_extension_t* const all[] = {&xcb_composite_id, &xcb_damage_id,  &xcb_shm_id,
                                    &xcb_randr_id,     &xcb_xfixes_id,  &xcb_shape_id,
                                    &xcb_res_id,       &xcb_xc_misc_id, &xcb_input_id};
    for (xcb_extension_t* const extension : all)
        xcb_prefetch_extension_data(Get(), extension);
    RoundTrip();
    const auto find = [this](xcb_extension_t& extension) {
        return xcb_get_extension_data(Get(), &extension);
    };
    const auto present = [&find](xcb_extension_t& extension) {
        const xcb_query_extension_reply_t* const found = find(extension);
        return found != nullptr && found->present != 0;
    };
    Check();
    m_extensions.composite = present(xcb_composite_id);
    m_extensions.damage = present(xcb_damage_id);
    m_extensions.shm = present(xcb_shm_id);
    m_extensions.randr = present(xcb_randr_id);
    m_extensions.xfixes = present(xcb_xfixes_id);
    m_extensions.shape = present(xcb_shape_id);
    m_extensions.xres = present(xcb_res_id);
    m_extensions.xinput = present(xcb_input_id);
    m_extensions.damageEvent = m_extensions.damage ? find(xcb_damage_id)->first_event : std::uint8_t{0};
    m_extensions.randrEvent = m_extensions.randr ? find(xcb_randr_id)->first_event : std::uint8_t{0};
    m_extensions.xfixesEvent = m_extensions.xfixes ? find(xcb_xfixes_id)->first_event : std::uint8_t{0};
    m_extensions.shapeEvent = m_extensions.shape ? find(xcb_shape_id)->first_event : std::uint8_t{0};
    m_extensions.xinputOpcode = m_extensions.xinput ? find(xcb_input_id)->major_opcode : std::uint8_t{0};
}

void X11Connection::LookUpVersions() {
    Pending<xcb_composite_query_version_reply_t> composite;
    Pending<xcb_damage_query_version_reply_t> damage;
    Pending<xcb_shm_query_version_reply_t> shm;
    Pending<xcb_randr_query_version_reply_t> randr;
    Pending<xcb_xfixes_query_version_reply_t> xfixes;
    Pending<xcb_shape_query_version_reply_t> shape;
    Pending<xcb_res_query_version_reply_t> xres;
    Pending<xcb_input_xi_query_version_reply_t> xinput;
    if (m_extensions.composite)
        composite = Ask<xcb_composite_query_version_reply_t>(xcb_composite_query_version(Get(), 0, 4));
    if (m_extensions.damage)
        damage = Ask<xcb_damage_query_version_reply_t>(xcb_damage_query_version(Get(), 1, 1));
    if (m_extensions.shm)
        shm = Ask<xcb_shm_query_version_reply_t>(xcb_shm_query_version(Get()));
    if (m_extensions.randr)
        randr = Ask<xcb_randr_query_version_reply_t>(xcb_randr_query_version(Get(), 1, 5));
    if (m_extensions.xfixes)
        xfixes = Ask<xcb_xfixes_query_version_reply_t>(xcb_xfixes_query_version(Get(), 5, 0));
    if (m_extensions.shape)
        shape = Ask<xcb_shape_query_version_reply_t>(xcb_shape_query_version(Get()));
    if (m_extensions.xres)
        xres = Ask<xcb_res_query_version_reply_t>(xcb_res_query_version(Get(), 1, 2));
    if (m_extensions.xinput)
        xinput = Ask<xcb_input_xi_query_version_reply_t>(xcb_input_xi_query_version(Get(), 2, 2));
    m_extensions.composite = IsAtLeast(Await(composite), 0, 2);
    m_extensions.damage = IsAtLeast(Await(damage), 1, 1);
    m_extensions.shm = IsAtLeast(Await(shm), 1, 2);
    m_extensions.randr = IsAtLeast(Await(randr), 1, 5);
    m_extensions.xfixes = IsAtLeast(Await(xfixes), 2, 0);
    m_extensions.shape = IsAtLeast(Await(shape), 1, 1);
    m_extensions.xinput = IsAtLeast(Await(xinput), 2, 2);
    const auto xresVersion = Await(xres); // names its fields differently
    m_extensions.xres =
        xresVersion != nullptr &&
        (xresVersion->server_major > 1 || (xresVersion->server_major == 1 && xresVersion->server_minor >= 2));
}

void X11Connection::LookUpAtoms() {
    std::vector<Pending<xcb_intern_atom_reply_t>> answers;
    answers.reserve(m_atoms.size());
    for (const char* const each : ATOM_NAMES) {
        std::string name = each;
        if (answers.size() == static_cast<std::size_t>(AtomName::NET_WM_CM_S0))
            name += std::to_string(m_screenNumber);
        answers.push_back(Ask<xcb_intern_atom_reply_t>(
            xcb_intern_atom(Get(), 0, static_cast<std::uint16_t>(name.size()), name.c_str())));
    }
    for (std::size_t place = 0; place < m_atoms.size(); ++place) {
        const auto answer = Await(answers[place]);
        m_atoms[place] = answer != nullptr ? answer->atom : xcb_atom_t{XCB_ATOM_NONE};
    }
}

} // namespace platform::x11
