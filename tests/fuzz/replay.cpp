// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

// Hands the files of the folders that it is given to a fuzzer, without the fuzzing compiler: replay FOLDER...

namespace fs = std::filesystem;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

std::vector<fs::path> FilesIn(const char* folder) {
    std::vector<fs::path> files;
    for (const fs::directory_entry& entry : fs::directory_iterator(folder)) {
        if (entry.is_regular_file())
            files.push_back(entry.path());
    }
    std::sort(files.begin(), files.end());
    return files;
}

bool Replay(const fs::path& file) {
    // Told first: a finding ends the process.
    std::printf("%s\n", file.filename().c_str());
    std::fflush(stdout);
    std::ifstream stream(file, std::ios::binary);
    const std::vector<char> bytes{std::istreambuf_iterator<char>(stream), {}};
    if (!stream.is_open() || stream.bad())
        return false;
    const std::vector<std::uint8_t> data(bytes.begin(), bytes.end());
    LLVMFuzzerTestOneInput(data.data(), data.size());
    return true;
}

int ReplayAll(int count, char** folders) {
    int replayed = 0;
    for (int i = 0; i < count; ++i) {
        for (const fs::path& file : FilesIn(folders[i])) {
            if (!Replay(file)) {
                std::fprintf(stderr, "can't be read: %s\n", file.c_str());
                return 1;
            }
            ++replayed;
        }
    }
    std::printf("%d texts\n", replayed);
    return replayed > 0 ? 0 : 1;
}

} // namespace

int main(int argc, char** argv) {
    try {
        return ReplayAll(argc - 1, argv + 1);
    } catch (const std::exception& error) {
        std::fprintf(stderr, "%s\n", error.what());
        return 1;
    }
}
