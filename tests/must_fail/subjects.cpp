#include "subjects.h"

#include <cerrno>
#include <filesystem>
#include <stdexcept>

#include "e2e/artefacts.h"
#include "src/DownloadDelegate.h"
#include "support/code_directory_builder.h"
#include "support/controller_run.h"
#include "support/executable_image_builder.h"
#include "support/message_capture.h"
#include "values/date.h"

namespace pinwell::test {
namespace {

constexpr values::Date kNow{1795204500};  // 2026-11-20 19:55:00 UTC
constexpr std::size_t kData = 1000;       // bytes of an artefact's own

std::string ticketPath(const std::string& bundle) {
    return bundle + "/Contents/CodeResources";
}

Subject bundle() {
    const Data directory = CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
    return {
        "bundle", "Sample.app", 2, codeHashOf(2, directory),
        [directory](const std::string& path, const std::optional<Data>& ticket) {
            BundleBuilder()
                .executable(
                    ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(directory).build()).build())
                .write(path);
            if (ticket) writeFile(ticketPath(path), base::ByteView(*ticket));
        }};
}

Subject file(std::string name, const Artefact& artefact) {
    return {std::move(name), artefact.name, artefact.algorithm, artefact.hash,
            [artefact](const std::string& path, const std::optional<Data>& ticket) {
                writeFile(path, ticket ? artefact.stapledWith(*ticket) : artefact.contents);
            }};
}

trust::CertificateList parse(const std::vector<Data>& ders) {
    trust::CertificateList certificates;
    for (const Data& der : ders) certificates.push_back(trust::X509Certificate::parse(der));
    return certificates;
}

}  // namespace

const std::vector<Subject>& subjects() {
    static const std::vector<Subject> all{bundle(), file("signedImage", signedImage(irregularData(kData))),
                                          file("unsignedImage", unsignedImage(irregularData(kData))),
                                          file("package", signedPackage(irregularData(kData)))};
    return all;
}

const Subject& subjectNamed(const std::string& name) {
    for (const Subject& subject : subjects())
        if (subject.name == name) return subject;
    throw std::runtime_error("no subject is called " + name);
}

std::string contentsOf(const std::string& path) {
    const std::string file = std::filesystem::is_directory(path) ? ticketPath(path) : path;
    return std::filesystem::is_regular_file(file) ? readFile(file) : std::string();
}

ToolRun::ToolRun(const SignerAnchors& anchors)
    : codeSigning_(codesign::makeCodeSigningService()),
      trust_(trust::makeTrustService(
          [anchors] {
              return trust::Anchors{parse(anchors.roots), parse(anchors.compatibility),
                                    parse(anchors.allowed), parse(anchors.denied)};
          },
          [] { return kNow; })),
      services_{platform_.files,
                *platform_.types,
                *codeSigning_,
                *trust_,
                platform_.https,
                platform_.userDefaults,
                platform_.systemLog,
                platform_.platformDirectory,
                [](int status) { throw ProcessExit{status}; }} {
    std::filesystem::create_directory(platform_.directory / "tmp");
    platform_.files.fail("trashItem", ENOENT);  // a swap leaves nothing to trash
}

int ToolRun::validate(const std::string& path, const std::string& answer) {
    return run(path, answer, kOperationValidate);
}

int ToolRun::staple(const std::string& path, const std::string& answer,
                    const std::function<void()>& meanwhile) {
    return run(path, answer, kOperationStaple, meanwhile);
}

bool ToolRun::passesOffline(const std::string& path) {
    const MessageCapture output(kVerbosityNormal);
    const auto file = PWHashedFile::initWithFileURL(URL::fileURLWithPath(path), services_);
    return file != nullptr && DownloadDelegate(file, services_).isExistingTicketValid();
}

int ToolRun::run(const std::string& path, const std::string& answer, std::uint8_t operation,
                 const std::function<void()>& meanwhile) {
    const MessageCapture output(kVerbosityNormal);
    return statusOfRun(operation, URL::fileURLWithPath(path), platform_, services_, answer, meanwhile);
}

}  // namespace pinwell::test
