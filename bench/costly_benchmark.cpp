// Measures every costly input of the tests (tests/costly/) at full length, in absolute numbers:
//   costly_benchmark [--length MEBIBYTES] [--list] [NAME...]
//
// Prints a line for each row: its length, processor time, memory and outcome, and its control's time. A name
// selects the rows that begin with it. Exits with 1 if a row takes more than two seconds of processor time or
// 256 MiB.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <string_view>
#include <vector>

#include "costly/costly_input.h"
#include "costly/measured_read.h"

namespace {

using pinwell::base::Data;
using pinwell::test::CostlyInput;
using pinwell::test::MeasuredRead;

constexpr double kMaximumSeconds = 2;
constexpr double kMaximumMebibytes = 256;
constexpr std::size_t kMebibyte = std::size_t{1024} * 1024;
constexpr std::size_t kUsualLength = 16;  // MiB
constexpr unsigned kGiveUp = 120;         // seconds
constexpr int kRuns = 2;
constexpr int kExitUsage = 64;

struct Choice {
    std::size_t length = kUsualLength * kMebibyte;
    bool isListing = false;
    std::vector<std::string_view> names;

    bool takes(const CostlyInput& row) const {
        return names.empty() || std::any_of(names.begin(), names.end(), [&](std::string_view name) {
                   return row.name.starts_with(name);
               });
    }
};

Choice chosen(int argc, char** argv) {
    Choice choice;
    for (int i = 1; i < argc; ++i) {
        const std::string_view word = argv[i];
        if (word == "--list") {
            choice.isListing = true;
        } else if (word == "--length" && i + 1 < argc) {
            choice.length = std::strtoul(argv[++i], nullptr, 10) * kMebibyte;
        } else if (word.starts_with('-')) {
            std::fprintf(stderr, "usage: costly_benchmark [--length MEBIBYTES] [--list] [NAME...]\n");
            std::exit(kExitUsage);
        } else {
            choice.names.push_back(word);
        }
    }
    return choice;
}

/// Whether the row keeps within the limits.
bool measure(const CostlyInput& row, std::size_t length) {
    const Data costly = row.costly(length);
    const MeasuredRead got = pinwell::test::measureRead(row.read, costly, kRuns, kGiveUp);
    const MeasuredRead control = pinwell::test::measureRead(row.read, row.control(length), kRuns, kGiveUp);
    const bool isKept =
        got.failure.empty() && got.seconds <= kMaximumSeconds && got.mebibytes <= kMaximumMebibytes;
    std::printf("%-32s %6.1f %7.3f %7.1f %-8s %7.3f  %s%s\n", row.name.c_str(),
                static_cast<double>(costly.size()) / kMebibyte, got.seconds, got.mebibytes,
                got.isTaken ? "taken" : "refused", control.seconds, row.cost.c_str(), isKept ? "" : " <--");
    if (!got.failure.empty()) std::printf("    %s\n", got.failure.c_str());
    if (!control.failure.empty()) std::printf("    the control: %s\n", control.failure.c_str());
    std::fflush(stdout);
    return isKept;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        const Choice choice = chosen(argc, argv);
        std::size_t rows = 0;
        std::size_t beyond = 0;
        if (!choice.isListing)
            std::printf("%-32s %6s %7s %7s %-8s %7s  %s\n", "input", "MiB", "s", "MiB", "", "control", "");
        for (const CostlyInput& row : pinwell::test::costlyInputs()) {
            if (!choice.takes(row)) continue;
            ++rows;
            if (choice.isListing)
                std::printf("%-32s %s\n", row.name.c_str(), row.cost.c_str());
            else if (!measure(row, choice.length))
                ++beyond;
        }
        if (!choice.isListing)
            std::printf("%zu inputs, %zu beyond %.0f s or %.0f MiB\n", rows, beyond, kMaximumSeconds,
                        kMaximumMebibytes);
        return rows > 0 && beyond == 0 ? 0 : 1;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "costly_benchmark: %s\n", failure.what());
        return 1;
    }
}
