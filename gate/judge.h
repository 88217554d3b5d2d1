// The verdict on one path: its ticket, its bytes, and what the policy asks besides.
#pragma once

#include <string>

#include "gate/options.h"
#include "gate/result.h"
#include "src/platform.h"
#include "verify/workers.h"

namespace pinwell::gate {

/// May be used from several threads at once. The tool's message functions must be silent.
class Judge {
  public:
    Judge(const Platform& platform, const Options& options, verify::Workers& workers)
        : platform_(platform), options_(options), workers_(workers) {}

    /// Never throws for what is wrong with the artefact. Throws std::bad_alloc.
    Result judge(const std::string& path) const;

  private:
    Platform platform_;
    const Options& options_;
    verify::Workers& workers_;
};

}  // namespace pinwell::gate
