#include "src/record_name.h"

#include "foundation/format.h"

namespace pinwell {
namespace {

constexpr int kRecordNameVersionPlain = 1;
constexpr int kRecordNameVersionWithAlgorithm = 2;

}  // namespace

std::string recordNameForHash(std::uint32_t algorithm, foundation::ByteView hash) {
    const std::string hex = foundation::toHex(hash);
    if (algorithm == 0) return foundation::format("%d/%@", kRecordNameVersionPlain, hex);
    return foundation::format("%d/%d/%@", kRecordNameVersionWithAlgorithm, algorithm, hex);
}

}  // namespace pinwell
