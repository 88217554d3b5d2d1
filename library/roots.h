// The contents of TrustedRoots. For this folder only.
#pragma once

#include "pinwell/ticket.h"
#include "trust/anchors.h"

namespace pinwell::ticket {
inline namespace v1 {

struct TrustedRoots::Contents {
    trust::Anchors anchors;
    std::vector<std::string> problems;
};

struct TrustedRootsAccess {
    static const std::shared_ptr<const TrustedRoots::Contents>& contentsOf(const TrustedRoots& roots) {
        return roots.contents_;
    }
};

}  // namespace v1
}  // namespace pinwell::ticket
