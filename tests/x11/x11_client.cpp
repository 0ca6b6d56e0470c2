// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_client_windows.h"

#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <functional>
#include <iostream>
#include <map>
#include <sstream>
#include <string>

/// An application that does what it is told, line by line, on its standard input, and answers each line with
/// "ok", perhaps with a number, or "no" once the server has done it.
///
///     x11_client NAME            with DISPLAY set
///     create WINDOW X Y W H RRGGBB [override] [argb] [none] [idle] [shaped] [decorated] [unmapped]
///            [inputonly] [type=DOCK] [border=N] [extents=N] [alpha=N] [slow=MS] [id=HEX]
///            [mark=RRGGBB]
///     map, unmap, destroy, raise, lower, paint, minimise, restore, above WINDOW
///     place WINDOW X Y W H       recolour WINDOW RRGGBB
///     property WINDOW NAME TYPE FORMAT [HEX BYTES]
///     hammer X Y W H RRGGBB SEED [every=MS] and calm
///     churn COUNT                connect
///
/// When the server ends it goes on, until its input ends.
namespace {

class Client {
public:
    explicit Client(const std::string& name) : m_windows(name) {
        AddCommandsOnWindows();
        AddOtherCommands();
    }

    int Run() {
        std::cout << (m_windows.Connect() ? "ok" : "no") << std::endl;
        while (Wait()) {
            if (m_windows.IsConnected())
                m_windows.Attend();
            if (m_hammering && m_windows.IsConnected())
                HammerALittle();
        }
        return 0;
    }

private:
    using Command = std::function<std::string(std::istream&)>;

    void AddCommandsOnWindows() {
        const auto byName = [this](const std::string& command,
                                   bool (ClientWindows::*action)(const std::string&)) {
            m_commands[command] = [this, action](std::istream& line) {
                return Answer((m_windows.*action)(Word(line)));
            };
        };
        byName("map", &ClientWindows::Map);
        byName("unmap", &ClientWindows::Unmap);
        byName("destroy", &ClientWindows::Destroy);
        byName("paint", &ClientWindows::Paint);
        byName("minimise", &ClientWindows::Minimise);
        byName("restore", &ClientWindows::Activate);
        byName("above", &ClientWindows::KeepAbove);
        m_commands["create"] = [this](std::istream& line) { return Create(line); };
        m_commands["raise"] = [this](std::istream& line) {
            return Answer(m_windows.Stack(Word(line), XCB_STACK_MODE_ABOVE));
        };
        m_commands["lower"] = [this](std::istream& line) {
            return Answer(m_windows.Stack(Word(line), XCB_STACK_MODE_BELOW));
        };
        m_commands["place"] = [this](std::istream& line) {
            const std::string window = Word(line);
            return Answer(m_windows.Place(window, Place(line)));
        };
        m_commands["recolour"] = [this](std::istream& line) {
            const std::string window = Word(line);
            return Answer(m_windows.Recolour(window, Hex(Word(line))));
        };
    }

    void AddOtherCommands() {
        m_commands["property"] = [this](std::istream& line) { return Property(line); };
        m_commands["hammer"] = [this](std::istream& line) { return Hammer(line); };
        m_commands["calm"] = [this](std::istream&) {
            m_hammering = false;
            m_windows.RoundTrip(); // it races against itself, so refusals are normal
            return Answer(true);
        };
        m_commands["churn"] = [this](std::istream& line) {
            m_windows.Churn(std::atoi(Word(line).c_str()));
            return Answer(true);
        };
        m_commands["connect"] = [this](std::istream&) { return Answer(m_windows.Connect()); };
    }

    static std::string Word(std::istream& line) {
        std::string word;
        line >> word;
        return word;
    }

    static std::uint32_t Hex(const std::string& text) {
        return static_cast<std::uint32_t>(std::strtoul(text.c_str(), nullptr, 16));
    }

    static ClientPlace Place(std::istream& line) {
        ClientPlace place;
        line >> place.x >> place.y >> place.width >> place.height;
        return place;
    }

    std::string Answer(bool done) { return m_windows.RoundTrip() && done ? "ok" : "no"; }

    std::string Create(std::istream& line) {
        const std::string name = Word(line);
        ClientOptions options;
        options.place = Place(line);
        options.rgb = Hex(Word(line));
        for (std::string word; line >> word;)
            TakeOption(options, word);
        if (!m_windows.IsConnected())
            return "no";
        const auto id = m_windows.Create(name, options);
        return Answer(id.has_value()) == "ok" ? "ok " + std::to_string(*id) : "no";
    }

    static void TakeOption(ClientOptions& options, const std::string& word) {
        const std::size_t equals = word.find('=');
        const std::string value = equals != std::string::npos ? word.substr(equals + 1) : std::string();
        const std::map<std::string, bool*> flags{{"override", &options.overrideRedirect},
                                                 {"none", &options.noBackground},
                                                 {"idle", &options.idle},
                                                 {"shaped", &options.shaped},
                                                 {"decorated", &options.decorated},
                                                 {"unmapped", &options.unmapped},
                                                 {"inputonly", &options.inputOnly}};
        const auto flag = flags.find(word);
        if (flag != flags.end())
            *flag->second = true;
        else if (word == "argb")
            options.depth = 32;
        else if (word.rfind("alpha=", 0) == 0)
            options.alpha = std::atoi(value.c_str());
        else if (word.rfind("type=", 0) == 0)
            options.type = value;
        else if (word.rfind("slow=", 0) == 0)
            options.slowMs = std::atoi(value.c_str());
        else if (word.rfind("border=", 0) == 0)
            options.border = std::atoi(value.c_str());
        else if (word.rfind("extents=", 0) == 0)
            options.extents = std::atoi(value.c_str());
        else if (word.rfind("id=", 0) == 0)
            options.id = Hex(value);
        else if (word.rfind("mark=", 0) == 0)
            options.mark = Hex(value);
    }

    std::string Property(std::istream& line) {
        const std::string window = Word(line);
        const std::string property = Word(line);
        const std::string type = Word(line);
        const int format = std::atoi(Word(line).c_str());
        const std::string digits = Word(line);
        std::string bytes;
        for (std::size_t i = 0; i + 1 < digits.size(); i += 2)
            bytes.push_back(static_cast<char>(Hex(digits.substr(i, 2))));
        return Answer(m_windows.SetProperty(window, property, type, format, bytes));
    }

    std::string Hammer(std::istream& line) {
        m_around = Place(line);
        m_secret = Hex(Word(line));
        m_random = Hex(Word(line));
        const std::string pace = Word(line);
        m_longestBreath = pace.rfind("every=", 0) == 0 ? 2 * std::atoi(pace.c_str() + 6) : 0;
        m_nextStroke = std::chrono::steady_clock::now();
        m_hammering = true;
        return Answer(true);
    }

    /// The server has to have done these before the next ones are sent, and then there is a breath now and
    /// then, or it would do nothing else.
    void HammerALittle() {
        if (m_longestBreath > 0) {
            StrikeOnce();
            return;
        }
        for (int i = 0; i < 8; ++i)
            Strike();
        m_windows.RoundTrip();
    }

    void Strike() {
        m_random = m_random * 1664525U + 1013904223U;
        m_windows.HammerStep(m_around, m_secret, m_random >> 4);
    }

    /// At a slow pace, when it is time.
    void StrikeOnce() {
        const auto now = std::chrono::steady_clock::now();
        if (now < m_nextStroke)
            return;
        Strike();
        m_windows.RoundTrip();
        m_nextStroke =
            now + std::chrono::milliseconds((m_random >> 8) % static_cast<unsigned>(m_longestBreath));
    }

    /// False when there is nobody to obey any more.
    bool Wait() {
        pollfd ready[2] = {{STDIN_FILENO, POLLIN, 0}, {m_windows.Descriptor(), POLLIN, 0}};
        const bool hammers = m_hammering && m_windows.IsConnected();
        poll(ready, hammers ? 1 : 2,
             hammers ? static_cast<int>(m_random >> 8 & 3) : m_windows.MillisecondsToPainting());
        return ready[0].revents == 0 || Obey();
    }

    bool Obey() {
        char bytes[4096];
        const ssize_t count = read(STDIN_FILENO, bytes, sizeof(bytes));
        if (count <= 0)
            return false;
        m_input.append(bytes, static_cast<std::size_t>(count));
        for (std::size_t end = m_input.find('\n'); end != std::string::npos; end = m_input.find('\n')) {
            std::istringstream line(m_input.substr(0, end));
            m_input.erase(0, end + 1);
            const auto command = m_commands.find(Word(line));
            std::cout << (command != m_commands.end() ? command->second(line) : "no") << std::endl;
        }
        return true;
    }

    ClientWindows m_windows;
    std::map<std::string, Command> m_commands;
    std::string m_input;
    ClientPlace m_around;
    std::uint32_t m_secret = 0;
    std::uint32_t m_random = 1;
    int m_longestBreath = 0; // ms; 0 for one as fast as it goes
    std::chrono::steady_clock::time_point m_nextStroke;
    bool m_hammering = false;
};

} // namespace

int main(int count, char** arguments) {
    return Client(count > 1 ? arguments[1] : "client").Run();
}
