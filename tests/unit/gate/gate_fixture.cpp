#include "gate_fixture.h"

#include <filesystem>

#include "retrieval/artefact_run.h"
#include "src/DownloadDelegate.h"
#include "src/messages.h"
#include "verify/verify.h"

namespace pinwell::test {

GateTest::GateTest() {
    verboseLevel = kVerbosityQuiet;
    std::filesystem::create_directory(directory / "tmp");
    writeFile(directory / "platform/roots/root.pem", chain.root.pem());
}

Result GateTest::judge(const std::string& path, const gate::TicketDirectory* tickets) const {
    using Tickets = gate::Options::Tickets;
    gate::Options options;
    options.tickets = tickets == nullptr ? Tickets::offline : Tickets::directory;
    options.paths = {path};
    return gate::judgeAll({path}, options, tickets, host_.services()).at(0);
}

void GateTest::staple(const std::string& path) const {
    const Result fresh = judge(path);
    ASSERT_FALSE(fresh.codeHash.empty()) << path;
    // Of the longest hashes, so that shorter ones are padded.
    constexpr std::uint16_t kHashLength = 48;
    constexpr std::uint8_t kSha384 = 4;
    TicketPayloadBuilder payload;
    payload.hashLength(kHashLength);
    const auto list = [&](std::uint8_t type, Data hash) {
        hash.resize(kHashLength);
        payload.entry(type, hash);
    };
    list(static_cast<std::uint8_t>(fresh.digestType), fresh.codeHash);
    const verify::Kind kind = fresh.kind == "bundle"      ? verify::Kind::bundle
                              : fresh.kind == "diskImage" ? verify::Kind::diskImage
                                                          : verify::Kind::package;
    verify::Workers workers(1);
    for (const verify::CodeIdentity& code : verify::verifyArtefact({kind, path}, workers).code.identities)
        for (const Data& hash : code.codeHashes) list(hash.size() == kHashLength ? kSha384 : 2, hash);
    const Data ticket = SatchelBuilder::of(chain, payload.build()).build();
    retrieval::ArtefactRun run(path, kOperationStaple, host_.services());
    EXPECT_EQ(run.attach([&](const std::string&) { return base::Result<Data>(ticket); }).exitStatus, 0)
        << path;
}

std::string GateTest::stapled(const std::string& name, ByteView bytes) const {
    const std::string path = directory / name;
    writeFile(path, bytes);
    staple(path);
    return path;
}

std::vector<std::string> failuresOf(const Result& result) {
    std::vector<std::string> failures;
    for (const verify::Check& check : verify::flattened(result.checks))
        if (check.outcome == verify::Outcome::failed) failures.push_back(check.name + ": " + check.place);
    return failures;
}

}  // namespace pinwell::test
