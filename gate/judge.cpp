#include "gate/judge.h"

#include <memory>
#include <optional>
#include <utility>

#include "codesign/byte_source.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "foundation/format.h"
#include "gate/ticket.h"
#include "src/ticket_record.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "verify/check_names.h"
#include "verify/verify.h"

namespace pinwell::gate {

using foundation::format;
using foundation::URL;
using verify::Kind;
using verify::Outcome;

namespace {

constexpr const char* kStapledTicket = "stapled ticket";

std::string reasonOf(const foundation::Error& error) {
    const std::string& reason = error.localizedFailureReason();
    return reason.empty() ? error.localizedDescription() : reason;
}

const char* nameOf(Kind kind) {
    switch (kind) {
        case Kind::bundle:
            return "bundle";
        case Kind::executable:
            return "executable";
        case Kind::diskImage:
            return "diskImage";
        case Kind::package:
            break;
    }
    return "package";
}

bool isExecutableImage(const std::string& path) {
    try {
        return codesign::isExecutableImage(codesign::FileSource(path));
    } catch (const codesign::CodeError&) {
        return false;
    }
}

/// The kind that the tool sees; `nullopt` for what it does not take, or only takes for want of a better one.
std::optional<Kind> kindOf(const PWHashedFile& file, bool isFile, const std::string& path) {
    if (dynamic_cast<const PWHashedDiskImage*>(&file) != nullptr && isFile) return Kind::diskImage;
    if (dynamic_cast<const PWHashedFlatPackage*>(&file) != nullptr && isFile) return Kind::package;
    if (dynamic_cast<const PWHashedBundle*>(&file) == nullptr) return std::nullopt;
    if (!isFile) return Kind::bundle;
    return isExecutableImage(path) ? std::optional(Kind::executable) : std::nullopt;
}

/// One run of the judge.
class Case {
  public:
    Case(const Platform& platform, const Options& options, verify::Workers& workers, const std::string& path)
        : platform_(platform), options_(options), workers_(workers) {
        result_.path = path;
    }

    Result run() && {
        if (!open()) return std::move(result_);
        readTicket();
        if (!options_.isShallow) verifyBytes();
        conclude();
        return std::move(result_);
    }

  private:
    void unreadable(std::string why) {
        result_.verdict = Verdict::unreadable;
        result_.conclusion = std::move(why);
        result_.checks.cannotRead(verify::kArtefact, {}, result_.conclusion);
    }

    bool open() {
        // A URL is made absolute with the working directory; a path is shown as it was given.
        const URL url = URL::fileURLWithPath(result_.path);
        if (const auto properties = platform_.files.resourceProperties(url); !properties) {
            unreadable("The path cannot be read: " + reasonOf(properties.error()) + ".");
            return false;
        }
        const auto regular = platform_.files.isRegularFile(url);
        const bool isFile = regular && *regular;
        if (isFile) {
            if (const auto opened = platform_.files.openForReading(url); !opened) {
                unreadable("The file cannot be read: " + reasonOf(opened.error()) + ".");
                return false;
            }
        }
        file_ = PWHashedFile::initWithFileURL(url, platform_);
        const auto kind = file_ ? kindOf(*file_, isFile, url.path()) : std::nullopt;
        if (!kind) {
            unreadable("This is of no kind that carries a ticket.");
            return false;
        }
        kind_ = *kind;
        path_ = url.path();
        result_.kind = nameOf(kind_);
        return true;
    }

    void readTicket() {
        codeHash_ = file_->cdHash();
        if (codeHash_) {
            result_.codeHash = *codeHash_;
            result_.digestType = file_->digestAlgorithm();
            result_.recordName = recordNameForHash(result_.digestType, *codeHash_);
        }
        const std::optional<Data> bytes = file_->ticketData();
        if (!bytes) {
            result_.checks.fail(
                verify::kTicketStapled, kStapledTicket, "a ticket",
                kind_ == Kind::executable ? "an executable outside a bundle has no place for one" : "none");
            return;
        }
        result_.checks.pass(verify::kTicketStapled, kStapledTicket, "a ticket");
        stapled_.emplace(*bytes, platform_.trust);
        isAcceptable_ = checkTicket(*stapled_, codeHash_, kStapledTicket, result_.checks);
    }

    void verifyBytes() {
        verify::Report report = verify::verifyArtefact({kind_, path_}, workers_);
        isSigned_ = report.code.isSigned || codeHash_.has_value();
        result_.checks.sections.push_back(std::move(report.root));
        bytesOutcome_ = verify::worstOutcome(result_.checks.sections.back());
    }

    void conclude() {
        if (stapled_ && stapled_->isGenuine() && stapled_->isRevoked()) {
            set(Verdict::revoked, "The ticket is genuine, and it revokes the software.");
        } else if (bytesOutcome_ == Outcome::failed) {
            set(Verdict::altered, "This is not what was signed.");
        } else if (bytesOutcome_ == Outcome::unreadable) {
            set(Verdict::unreadable, "Not all of it can be read.");
        } else if (!isAcceptable_) {
            set(stapled_ ? Verdict::refused : Verdict::noTicket,
                stapled_ ? "The stapled ticket is not acceptable." : "No ticket is stapled to it.");
        } else {
            set(Verdict::good, "It is what was signed, and its ticket is good.");
        }
    }

    void set(Verdict verdict, const char* conclusion) {
        result_.verdict = verdict;
        result_.conclusion = conclusion;
    }

    const Platform& platform_;
    const Options& options_;
    verify::Workers& workers_;
    Result result_;
    std::shared_ptr<PWHashedFile> file_;
    Kind kind_ = Kind::bundle;
    std::string path_;
    std::optional<Data> codeHash_;
    std::optional<JudgedTicket> stapled_;
    bool isAcceptable_ = false;
    bool isSigned_ = false;
    Outcome bytesOutcome_ = Outcome::passed;
};

}  // namespace

Result Judge::judge(const std::string& path) const {
    return Case(platform_, options_, workers_, path).run();
}

}  // namespace pinwell::gate
