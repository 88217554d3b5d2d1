#include "inspect_fixture.h"

#include "src/messages.h"

namespace pinwell::test {

InspectTest::InspectTest()
    : codeSigning_(codesign::makeCodeSigningService()),
      codeDirectory_(CodeDirectoryBuilder().team("TEAM42").covers(2, emptyRequirements()).build()) {
    verboseLevel = kVerbosityQuiet;
    bundleHash = codeHashOf(2, codeDirectory_);
    writeFile(platform.platformDirectory.path() + "/roots/root.pem", chain.root.pem());
    trust_ = trust::makeTrustService(platform.platformDirectory, [](std::string_view) {});
}

Platform InspectTest::services() {
    const Platform fakes = platform.servicesWith(*codeSigning_);
    return {fakes.files,        fakes.types,     fakes.codeSigning, *trust_,          fakes.https,
            fakes.userDefaults, fakes.systemLog, fakes.directory,   fakes.exitProcess};
}

Report InspectTest::inspect(const std::string& path) {
    return inspect::Inspector(services()).inspect(path);
}

Data InspectTest::sealed(const TicketPayloadBuilder& payload) const {
    return SatchelBuilder::of(chain, payload.build()).build();
}

std::string InspectTest::write(const std::string& name, std::string_view contents) const {
    std::string path = platform.directory / name;
    writeFile(path, contents);
    return path;
}

std::string InspectTest::stapled(const Artefact& artefact, const Data& ticket) const {
    return write(artefact.name, artefact.stapledWith(ticket));
}

std::string InspectTest::bundle(const Data& ticket) const {
    const std::string path = platform.directory / "Sample.app";
    const Data signature = SuperBlobBuilder::adHoc(codeDirectory_).build();
    BundleBuilder().executable(ExecutableImageBuilder().signature(signature).build()).write(path);
    if (!ticket.empty()) writeFile(ticketFileOf(path), ticket);
    return path;
}

}  // namespace pinwell::test
