// Runs a target over files, and over all files below directories, in the place of the fuzzer: any compiler
// will do. A directory that does not exist holds nothing; to have been given no input at all is a failure,
// and so is an input that takes as much processor time as the fuzzer would call a hang.
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size);

namespace {

namespace fs = std::filesystem;

/// Of processor time, for one input. The slowest takes a fraction of a second under a sanitizer.
constexpr std::clock_t kMaximumSeconds = 20;

std::vector<fs::path> filesAt(const fs::path& place) {
    if (!fs::is_directory(place)) return fs::exists(place) ? std::vector{place} : std::vector<fs::path>();
    std::vector<fs::path> files;
    for (const auto& entry : fs::recursive_directory_iterator(place))
        if (entry.is_regular_file()) files.push_back(entry.path());
    return files;
}

void replay(const fs::path& path) {
    std::ifstream file(path, std::ios::binary);
    const std::string contents{std::istreambuf_iterator<char>(file), {}};
    const std::vector<std::uint8_t> bytes(contents.begin(), contents.end());
    // What an input does is seen on standard error; this says which one it was.
    std::fprintf(stderr, "%s\n", path.c_str());
    const std::clock_t before = std::clock();
    LLVMFuzzerTestOneInput(bytes.data(), bytes.size());
    if (std::clock() - before > kMaximumSeconds * CLOCKS_PER_SEC) throw std::runtime_error("it is too slow");
}

}  // namespace

int main(int argc, char** argv) {
    try {
        std::size_t count = 0;
        for (const std::string& place : std::vector<std::string>(argv + 1, argv + argc)) {
            for (const fs::path& path : filesAt(place)) {
                replay(path);
                ++count;
            }
        }
        std::fprintf(stderr, "%zu inputs\n", count);
        return count > 0 ? 0 : 1;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "%s\n", failure.what());
        return 1;
    }
}
