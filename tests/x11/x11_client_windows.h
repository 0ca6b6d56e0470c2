// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <xcb/xcb.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

struct ClientPlace {
    int x = 0;
    int y = 0;
    int width = 1;
    int height = 1;
};

struct ClientOptions {
    ClientPlace place;
    std::uint32_t rgb = 0;
    /// The colour of its upper left corner, a third as wide and a quarter as high as the window, once the
    /// client has painted.
    std::optional<std::uint32_t> mark{};
    xcb_window_t id = 0; ///< 0 for one that was never used before.
    int border = 0;
    int depth = 0;   ///< 0 for the screen's; 32 for a window with alpha.
    int alpha = 255; ///< Of a window with alpha: how opaque its colour is.
    int extents = 0; ///< How much on each side it says is shadow.
    bool overrideRedirect = false;
    bool inputOnly = false;
    bool decorated = false;
    bool noBackground = false; ///< Nothing is painted but by the client itself.
    bool idle = false;         ///< The client doesn't paint either until it is told to.
    int slowMs = 0;            ///< How long the client takes to paint what was exposed.
    bool shaped = false;       ///< Its lower right quarter isn't there.
    bool unmapped = false;
    std::string type; ///< Such as "DOCK"; nothing is said when empty.
};

/// One connection of an application to a server, with its windows. When the server is gone everything gives
/// false until the next connection.
class ClientWindows {
public:
    explicit ClientWindows(std::string applicationName);
    ~ClientWindows();
    ClientWindows(const ClientWindows&) = delete;
    ClientWindows& operator=(const ClientWindows&) = delete;

    /// To DISPLAY. What was on another connection is forgotten. The application has one window of its own
    /// then, a pixel in the corner.
    bool Connect();
    bool IsConnected() const;
    int Descriptor() const;
    /// Takes in what the server has sent, and paints what is due.
    void Attend();
    /// Until something is to be painted; -1 when nothing is.
    int MillisecondsToPainting() const;
    /// False when the server is gone, or has refused anything since the last time.
    bool RoundTrip();

    std::optional<xcb_window_t> Create(const std::string& name, const ClientOptions& options);
    bool Destroy(const std::string& name);
    bool Map(const std::string& name);
    bool Unmap(const std::string& name);
    bool Place(const std::string& name, const ClientPlace& place);
    bool Stack(const std::string& name, std::uint32_t mode);
    bool Recolour(const std::string& name, std::uint32_t rgb);
    bool Paint(const std::string& name);
    bool Minimise(const std::string& name);
    bool Activate(const std::string& name);
    bool KeepAbove(const std::string& name);
    bool SetProperty(const std::string& name, const std::string& property, const std::string& type,
                     int format, const std::string& bytes);

    /// One step of somebody who maps, raises, moves, resizes and closes windows of that colour around a
    /// place, as fast as it goes.
    void HammerStep(const ClientPlace& around, std::uint32_t rgb, std::uint32_t random);
    /// Creates and destroys so many windows.
    void Churn(int count);

private:
    struct Window {
        xcb_window_t id = 0;
        xcb_gcontext_t context = 0;
        xcb_gcontext_t markContext = 0;
        ClientPlace place;
        std::uint32_t pixel = 0;
        int depth = 0;
        bool noBackground = false;
        bool idle = false;
        std::chrono::milliseconds slow{0};
        std::optional<std::chrono::steady_clock::time_point> paintsAt;
    };

    xcb_window_t NewName();
    const xcb_visualtype_t* VisualOf(int depth) const;
    std::uint32_t PixelOf(std::uint32_t rgb, int depth, int alpha = 255) const;
    xcb_atom_t Atom(const std::string& name);
    void SetWords(xcb_window_t window, const std::string& property, const std::string& type,
                  const std::vector<std::uint32_t>& words);
    xcb_window_t NewWindow(const ClientOptions& options, int depth);
    void Describe(const Window& window, const ClientOptions& options);
    void TellRoot(xcb_window_t window, const std::string& type, const std::vector<std::uint32_t>& words);
    void Expose(xcb_window_t exposed);
    void PaintDue();
    void Fill(const Window& window);
    Window* Find(const std::string& name);

    const std::string m_applicationName;
    xcb_connection_t* m_connection = nullptr;
    const xcb_screen_t* m_screen = nullptr;
    std::map<std::string, Window> m_windows;
    std::map<std::string, xcb_atom_t> m_atoms;
    std::uint32_t m_names = 0; // that were used, over all connections
    bool m_refused = false;
};
