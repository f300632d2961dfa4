// Hands each file it is given to a fuzz target, in a build without libFuzzer.
//
//     fuzz_replay_dictionary fuzz/corpus/dictionary        a folder, or single files
//
// The files are run forwards and then backwards: what one leaves behind must not matter to the next.
// Exit status 0 when every file ran; a target that finds a fault ends the process itself.
//
// SPDX-License-Identifier: MIT
#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <vector>

#include "fuzz/target.h"

namespace {

typedef std::vector<char> Input;

std::vector<std::filesystem::path> files_of(const std::filesystem::path& given) {
    std::vector<std::filesystem::path> files;
    if (!std::filesystem::is_directory(given)) return {given};
    for (const auto& entry : std::filesystem::directory_iterator(given)) files.push_back(entry.path());
    std::sort(files.begin(), files.end());
    return files;
}

Input read(const std::filesystem::path& file) {
    std::ifstream in(file, std::ios_base::binary);
    if (!in) throw std::filesystem::filesystem_error("cannot be read", file, {});
    return Input(std::istreambuf_iterator<char>(in), {});
}

// A block of the exact size, so that reading beyond the input is noticed.
void run(const Input& input) {
    const std::unique_ptr<std::uint8_t[]> exact(new std::uint8_t[input.size()]);
    std::copy(input.begin(), input.end(), exact.get());
    LLVMFuzzerTestOneInput(exact.get(), input.size());
}

}  // namespace

int main(int argc, char** argv) {
    std::vector<Input> inputs;
    for (int i = 1; i < argc; ++i) {
        for (const auto& file : files_of(argv[i])) inputs.push_back(read(file));
    }
    for (auto input = inputs.begin(); input != inputs.end(); ++input) run(*input);
    for (auto input = inputs.rbegin(); input != inputs.rend(); ++input) run(*input);
    std::printf("%zu inputs replayed\n", inputs.size());
    return inputs.empty() ? 1 : 0;
}
