// The platform inside another program: files, types, code signatures and trust, without network, log or user
// defaults. For this folder only.
#pragma once

#include <cstdint>
#include <memory>

#include "pinwell/ticket.h"
#include "src/platform.h"

namespace pinwell::library {

/// Owns its services; must outlive every user of services(). For one call, and one thread.
class LocalPlatform {
  public:
    /// `roots` null: nothing is trusted.
    LocalPlatform(const ticket::TrustedRoots* roots, std::int64_t evaluationTime);
    ~LocalPlatform();
    LocalPlatform(const LocalPlatform&) = delete;
    LocalPlatform& operator=(const LocalPlatform&) = delete;

    Platform services() const;

  private:
    struct Services;
    const std::unique_ptr<const Services> services_;
};

}  // namespace pinwell::library
