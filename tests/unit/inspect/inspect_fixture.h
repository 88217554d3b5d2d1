// A platform of real services, except the network. It trusts the test's tickets.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "artefacts.h"
#include "inspect/gather.h"
#include "support/executable_image_builder.h"
#include "support/test_platform.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

using inspect::Kind;
using inspect::Outcome;
using inspect::Report;

class InspectTest : public testing::Test {
  protected:
    InspectTest();

    Platform services();
    Report inspect(const std::string& path);

    Data sealed(const TicketPayloadBuilder& payload) const;
    /// A ticket that lists the artefact's hash.
    Data ticketFor(const Artefact& artefact) const { return sealed(artefact.payload()); }

    std::string write(const std::string& name, std::string_view contents) const;
    /// Writes the artefact with that ticket stapled to it, and returns its path.
    std::string stapled(const Artefact& artefact, const Data& ticket) const;

    /// A bundle of one signed executable, whose hash is `bundleHash`; stapled unless the ticket is empty.
    std::string bundle(const Data& ticket = {}) const;
    std::string ticketFileOf(const std::string& bundle) const { return bundle + "/Contents/CodeResources"; }

    TestPlatform platform;
    IssuedChain chain = TicketChain().issue();
    Data bundleHash;

  private:
    std::unique_ptr<codesign::CodeSigningService> codeSigning_;
    std::unique_ptr<trust::TrustService> trust_;
    Data codeDirectory_;
};

}  // namespace pinwell::test
