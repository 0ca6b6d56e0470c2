// SPDX-License-Identifier: Apache-2.0
#include "tools/doctor_command.h"

#include "platform/utf8.h"
#include "tools/doctor_diagnosis.h"
#include "tools/doctor_report.h"
#include "util/cm_clock.h"
#include "util/cm_trusted_file.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>

namespace {

constexpr const char* DEBUG_FILE = "share_config.json";

std::string Variable(const char* name) {
    const char* const value = std::getenv(name);
    return value != nullptr ? value : "";
}

std::string ReadableVariable(const char* name) {
    return platform::WithoutControls(platform::MendedUtf8(Variable(name)));
}

/// The folder's bare name and not the one for people, who may get to see another.
DebugFileState StateOfDebugFile(const std::string& folder) {
    if (CmReadTrustedFile(folder, DEBUG_FILE))
        return DebugFileState::Counts;
    struct stat status {};
    const bool isThere = lstat((folder + "/" + DEBUG_FILE).c_str(), &status) == 0;
    return isThere ? DebugFileState::Refused : DebugFileState::Absent;
}

EnvironmentFacts LookAtEnvironment() {
    EnvironmentFacts facts;
    facts.platform = ReadableVariable("SCREENSHARE_PLATFORM");
    facts.display = ReadableVariable("DISPLAY");
    facts.waylandDisplay = ReadableVariable("WAYLAND_DISPLAY");
    facts.sessionType = ReadableVariable("XDG_SESSION_TYPE");
    facts.debugFolder = Variable("SCREENSHARE_DEBUG_DIR");
    facts.debugFile = StateOfDebugFile(facts.DebugFolderInForce());
    facts.debugFolder = ReadableVariable("SCREENSHARE_DEBUG_DIR");
    return facts;
}

ServerFacts LookAtWindowServer() {
    using platform::Capability;
    const std::shared_ptr<platform::WindowServer> server = platform::CurrentWindowServer();
    ServerFacts facts;
    facts.name = server->Name();
    facts.displays = *server->GetDisplays();
    const std::shared_ptr<const platform::WindowSnapshot> windows = server->GetWindows();
    facts.windows = windows->Windows().size();
    facts.windowsOnScreen = static_cast<std::size_t>(
        std::count_if(windows->Windows().begin(), windows->Windows().end(),
                      [](const platform::WindowInfo& each) { return each.onScreen; }));
    facts.applications = server->GetApplications()->size();
    facts.permission = server->GetPermission();
    for (std::size_t i = 0; i < facts.capabilities.size(); ++i)
        facts.capabilities[i] = server->GetCapability(static_cast<Capability>(i));
    facts.life = server->GetLife().life;
    return facts;
}

} // namespace

DoctorFacts GatherDoctorFacts() {
    DoctorFacts facts;
    facts.environment = LookAtEnvironment();
    // First, since some X servers begin anew, and refuse for a moment, when their last client has left.
    facts.server = LookAtWindowServer();
    facts.x11 = platform::ReportOnX11({}, CmSteadyNow() + platform::DEFAULT_CONNECT_DEADLINE);
    return facts;
}

DoctorAnswer RunDoctor(DoctorForm form) {
    const DoctorFacts facts = GatherDoctorFacts();
    const Diagnosis diagnosis = Diagnose(facts);
    return {form == DoctorForm::Json ? DoctorJson(facts, diagnosis) : DoctorText(facts, diagnosis),
            diagnosis.CanShare() ? EXIT_CODE_DONE : EXIT_CODE_FAILED};
}
