// Artefacts in the form that a consumer gets: samples of the record service, stapled by the tool's own
// functions, with tickets of a trusted root. Everything except the network is real.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "gate/find.h"
#include "gate/run.h"
#include "src/host_platform.h"
#include "src/platform.h"
#include "support/environment.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

using base::ByteView;
using base::Data;
using gate::Result;

class GateTest : public testing::Test {
  protected:
    GateTest();

    /// The result of a run over one path, without the network; with `tickets`, as with --tickets.
    Result judge(const std::string& path, const gate::TicketDirectory* tickets = nullptr) const;
    int exitStatusFor(const std::string& path) const { return gate::exitStatusOf(judge(path).verdict); }

    /// The artefacts of a tree.
    gate::FoundArtefacts find(const std::string& path) const {
        return gate::findArtefacts(path, host_.services());
    }

    /// Staples a ticket that lists all code of the artefact. Fails the test if it cannot.
    void staple(const std::string& path) const;

    /// Writes the bytes to a file of that name and staples it. Returns its path.
    std::string stapled(const std::string& name, ByteView bytes) const;

    const TemporaryDirectory directory;
    const IssuedChain chain = TicketChain().issue();

  private:
    const ScopedVariable environment_{"PINWELL_PLATFORM", directory / "platform"};
    // A staple leaves the ticket and a copy of the signature area there.
    const ScopedVariable temporary_{"TMPDIR", directory / "tmp"};
    const HostPlatform host_{[](int) {}};
};

/// The checks of a result that failed, a line each: "NAME: PLACE".
std::vector<std::string> failuresOf(const Result& result);

}  // namespace pinwell::test
