// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_options.h"

#include <algorithm>
#include <charconv>
#include <functional>
#include <iterator>
#include <map>
#include <stdexcept>
#include <system_error>

namespace {

unsigned NumberOf(const std::string& text, unsigned least, unsigned most) {
    unsigned number = 0;
    const char* const end = text.data() + text.size();
    const auto result = std::from_chars(text.data(), end, number);
    if (result.ec != std::errc() || result.ptr != end || number < least || number > most)
        throw std::invalid_argument("no number from " + std::to_string(least) + " to " +
                                    std::to_string(most) + ": " + text);
    return number;
}

DeliveredKind KindOf(const std::string& name) {
    std::string names;
    for (const DeliveredKind& kind : AllDeliveredKinds()) {
        if (name == kind.name)
            return kind;
        names += std::string(" ") + kind.name;
    }
    throw std::invalid_argument("no kind: " + name + "; there are:" + names);
}

DeliveredFault FaultOf(const std::string& name) {
    const auto found = std::find(std::begin(DELIVERED_FAULT_NAMES), std::end(DELIVERED_FAULT_NAMES), name);
    if (found != std::end(DELIVERED_FAULT_NAMES))
        return static_cast<DeliveredFault>(found - std::begin(DELIVERED_FAULT_NAMES));
    std::string names;
    for (const char* each : DELIVERED_FAULT_NAMES)
        names += std::string(" ") + each;
    throw std::invalid_argument("no fault: " + name + "; there are:" + names);
}

void Take(PrivacyOptions& options, const std::string& option, const std::string& value) {
    constexpr unsigned MOST = 100'000'000;
    const std::map<std::string, std::function<void()>> takers{
        {"--histories", [&] { options.histories = NumberOf(value, 1, MOST); }},
        {"--seed", [&] { options.seed = NumberOf(value, 0, 4'000'000'000); }},
        {"--steps", [&] { options.steps = static_cast<int>(NumberOf(value, 1, 10'000)); }},
        {"--jobs", [&] { options.jobs = static_cast<int>(NumberOf(value, 1, 64)); }},
        {"--minutes", [&] { options.limit = std::chrono::minutes(NumberOf(value, 1, 10'000)); }},
        {"--kind", [&] { options.kinds = {KindOf(value)}; }},
        {"--fault", [&] { options.fault = FaultOf(value); }}};
    const auto taker = takers.find(option);
    if (taker == takers.end())
        throw std::invalid_argument("no option: " + option);
    taker->second();
}

} // namespace

std::vector<DeliveredKind> AllDeliveredKinds() {
    std::vector<DeliveredKind> kinds(std::begin(DELIVERED_KINDS), std::end(DELIVERED_KINDS));
    kinds.insert(kinds.end(), std::begin(DELIVERED_SESSION_KINDS), std::end(DELIVERED_SESSION_KINDS));
    std::stable_sort(kinds.begin(), kinds.end(), [](const DeliveredKind& one, const DeliveredKind& other) {
        return one.mode < other.mode;
    });
    return kinds;
}

std::optional<PrivacyOptions> ReadPrivacyOptions(int count, const char* const* arguments) {
    PrivacyOptions options;
    options.kinds = AllDeliveredKinds();
    for (int i = 1; i < count; i += 2) {
        const std::string option = arguments[i];
        if (option == "--help")
            return std::nullopt;
        if (i + 1 == count)
            throw std::invalid_argument(option + " wants a value");
        Take(options, option, arguments[i + 1]);
    }
    return options;
}

std::string PrivacyUsage() {
    return "privacy_program [--histories N] [--seed S] [--steps N] [--kind NAME] [--jobs N] [--minutes M]\n"
           "                [--fault NAME]\n"
           "Random histories of a shared desktop, spread evenly over the kinds of shares; each kind begins with\n"
           "seed S. Ends with 1 when something was seen that must not be, or too little was.\n";
}
