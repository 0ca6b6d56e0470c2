// SPDX-License-Identifier: Apache-2.0
#include "tools/png_folder.h"

#include "platform/image_codec.h"

#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <system_error>
#include <vector>

WriteResult PngFolder::Open() {
    std::error_code error;
    std::filesystem::create_directories(m_folder, error);
    if (error)
        return WriteFailure{EXIT_CODE_NOT_WRITTEN, "cannot make folder " + m_folder + ": " + error.message()};
    if (access(m_folder.c_str(), W_OK | X_OK) != 0)
        return FailureFromErrno("into folder " + m_folder, errno);
    return std::nullopt;
}

WriteResult PngFolder::Write(const std::string& name, platform::CGImageRef image) {
    const std::vector<std::uint8_t> data = platform::NSBitmapImageRep(std::move(image))
                                               .representationUsingType(platform::NSBitmapImageFileTypePNG);
    const std::string file = PathOf(name);
    if (data.empty())
        return WriteFailure{EXIT_CODE_FAILED, file + " cannot be made of that picture"};
    errno = 0;
    if (!platform::writeToFile(data, file.c_str(), true))
        return FailureFromErrno(file, errno);
    m_bytes += data.size();
    return std::nullopt;
}

std::string PngFolder::PathOf(const std::string& name) const {
    return (std::filesystem::path(m_folder) / name).string();
}
