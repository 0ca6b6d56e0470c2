// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/fuzz/fuzz_check.h"

#include <cstddef>
#include <cstdint>
#include <string>

/// Any text at all as a debug file: it is taken or refused, never both in part; what was taken can be asked
/// for by its exact types; what was refused leaves the last good document; no setting moves.

namespace {

using json::Value;

constexpr int FORMER_NUMBER = 1234;

AppShareConfig& Config() {
    return *AppShareConfig::Instance();
}

void RequireTheFormerDocument() {
    int number = 0;
    Require(Config().GetConfigInt("former", number) && number == FORMER_NUMBER,
            "a refused text leaves the last good document");
}

/// Each reader answers for its own type alone, and leaves what it was given otherwise.
void RequireExactTypes(const std::string& key, const Value& expected) {
    const json::ValueType type = expected.GetType();
    bool flag = true;
    int number = -77;
    double real = -7.75;
    std::string text = "untouched";
    Require(Config().GetConfigBool(key, flag) == (type == json::BoolVal), "GetConfigBool: bools only");
    Require(Config().GetConfigInt(key, number) == (type == json::IntVal), "GetConfigInt: ints only");
    Require(Config().GetConfigDouble(key, real) == (type == json::DoubleVal),
            "GetConfigDouble: doubles only");
    Require(Config().GetConfigString(key, text) == (type == json::StringVal),
            "GetConfigString: strings only");
    Require(flag == (type == json::BoolVal ? expected.ToBool() : true), "GetConfigBool gives the value");
    Require(number == (type == json::IntVal ? static_cast<int>(expected) : -77),
            "GetConfigInt gives the value");
    Require(IsSameDouble(real, type == json::DoubleVal ? static_cast<double>(expected) : -7.75),
            "GetConfigDouble gives the value");
    Require(text == (type == json::StringVal ? expected.ToString() : "untouched"),
            "GetConfigString gives the value");
}

void RequireMembers(const json::Object& object) {
    for (const auto& member : object) {
        Value value("untouched");
        Require(Config().GetConfigValue(member.first, value), "each key of the text is known");
        Require(IsSame(value, member.second), "each key has the value of the text");
        RequireExactTypes(member.first, member.second);
    }
}

void RequireTheDocument(const Value& document) {
    const bool isObject = document.GetType() == json::ObjectVal;
    if (isObject)
        RequireMembers(document.ToObject());
    Value value("untouched");
    const bool hasFormer = isObject && document.HasKey("former");
    Require(Config().GetConfigValue("former", value) == hasFormer, "nothing is left of the former document");
    Require(hasFormer || value.ToString() == "untouched", "a key that is absent leaves the value alone");
}

void RequireSettingsAtTheirDefaults() {
    Require(Config().m_nTraceOneByFrames == 100 && Config().m_nScreenCapturerType == 1 &&
                Config().m_nDummyCaptureWidth == 1024 && Config().m_nDummyCaptureHeight == 768 &&
                Config().m_nResampleScreenCaptureWidth == 1920 &&
                Config().m_nResampleScreenCaptureHeight == 1080 && Config().m_nDumpDataRingSize == 100 &&
                Config().m_nDumpDataEveryFrames == 10 && !Config().m_bDummyPoint &&
                !Config().m_bDummyCapture && !Config().m_bDummyEnumerator &&
                Config().m_bCaptureResampleEnable,
            "checking a text moves no setting");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string text(data, data + size);
    const std::string former = "{\"former\":" + std::to_string(FORMER_NUMBER) + "}";
    Require(Config().CheckConfig(former.c_str()), "a good text is taken");

    const bool isTaken = Config().CheckConfig(text.c_str());
    const Reading reading = ReadWith(json::Deserialize, text.substr(0, text.find('\0')));
    const bool isReadable = !reading.hasThrown && reading.value.GetType() != json::NULLVal;
    Require(isTaken == isReadable, "what the reader reads is taken, and nothing else");
    if (isTaken)
        RequireTheDocument(reading.value);
    else
        RequireTheFormerDocument();
    RequireSettingsAtTheirDefaults();

    Config().ClearConfig();
    Value value;
    Require(!Config().GetConfigValue("former", value), "nothing is left after ClearConfig");
    return 0;
}
