// Runs a target over files, and over all files below directories, instead of the fuzzer. Any compiler works.
// A missing directory counts as empty. A run without any input fails, and so does an input that takes so much
// processor time that the fuzzer would report a hang.
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

/// Processor time for one input. The slowest takes a fraction of a second under a sanitizer.
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
    // Standard error shows the effects of an input; this line names the input.
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
