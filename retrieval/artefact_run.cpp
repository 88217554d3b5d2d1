#include "retrieval/artefact_run.h"

#include <sys/stat.h>

#include <cerrno>
#include <utility>

#include "runtime/process.h"
#include "src/DownloadDelegate.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/messages.h"
#include "src/run.h"
#include "src/ticket_record.h"
#include "values/url.h"

namespace pinwell::retrieval {
namespace {

using values::URL;

// Thrown where the controller would end the process.
struct RunEnded {
    int status;
};

// Sessions without a connection: they keep the controller's request, and get the response from the caller.
class KeptTask : public https::Task {
  public:
    explicit KeptTask(const https::Request& request) : canStart_(request.url.has_value()) {}

    void resume() override {
        if (canStart_ && state_ == https::TaskState::suspended) state_ = https::TaskState::running;
    }
    https::TaskState state() const override { return state_; }
    std::optional<https::HTTPResponse> response() const override { return response_; }
    void setResponse(https::HTTPResponse response) { response_ = std::move(response); }

  private:
    const bool canStart_;
    https::TaskState state_ = https::TaskState::suspended;
    std::optional<https::HTTPResponse> response_;
};

class KeptSession : public https::Session {
  public:
    std::shared_ptr<https::Task> dataTask(https::Request request, https::DataCompletion completion) override {
        completion_ = std::move(completion);
        return std::make_shared<KeptTask>(request);
    }
    std::shared_ptr<https::Task> downloadTask(https::Request request) override {
        download_ = std::make_shared<KeptTask>(request);
        return download_;
    }
    https::DataCompletion takeCompletion() { return std::exchange(completion_, nullptr); }
    const std::shared_ptr<KeptTask>& download() const { return download_; }

  private:
    https::DataCompletion completion_;
    std::shared_ptr<KeptTask> download_;
};

class KeptSessions : public https::SessionService {
  public:
    base::Result<std::shared_ptr<https::Session>> ephemeralSession(https::SessionDelegate&) override {
        last_ = std::make_shared<KeptSession>();
        return std::shared_ptr<https::Session>(last_);
    }
    const std::shared_ptr<KeptSession>& last() const { return last_; }

  private:
    std::shared_ptr<KeptSession> last_;
};

Platform withSessions(const Platform& platform, https::SessionService& sessions) {
    return {platform.files,     platform.types,     platform.codeSigning,
            platform.trust,     sessions,           platform.userDefaults,
            platform.systemLog, platform.directory, [](int status) { throw RunEnded{status}; }};
}

// A download without an outcome must not look successful.
base::Error missingAsset() {
    return {base::kURLErrorDomain, static_cast<std::int64_t>(https::URLErrorCode::unknown),
            "The large ticket was not fetched."};
}

Cause causeOf(int status, const Answer& answer, const PWHashedFile& file) {
    switch (status) {
        case kExitOK:
            return Cause::worked;
        case kExitNoPermission:
            return Cause::revoked;
        case kExitCannotCreate:
            return file.wasRefusedAsChanged() ? Cause::changed : Cause::notWritable;
        case kExitNoHost:
            return answer.kind == Answer::Kind::untrusted ? Cause::untrusted : Cause::unreachable;
        case kExitNoInput:
            return Cause::notReadable;
        default:
            return answer.hasNoTicket() ? Cause::notIssued : Cause::notAcceptable;
    }
}

// The cause of a run that ended before its lookup.
Cause causeWithoutLookup(int status, PWHashedFile& file) {
    switch (status) {
        case kExitNoPermission:
            return Cause::revoked;
        case kExitNoInput:
            return Cause::notSigned;
        case kExitNoHost:
            return Cause::unreachable;
        default:
            return file.ticketData() ? Cause::notAcceptable : Cause::notStapled;
    }
}

std::string textOf(const timespec& time) {
    return std::to_string(time.tv_sec) + "." + std::to_string(time.tv_nsec);
}

// "SIZE,MODIFIED,CHANGED,INODE" of the file, without following a link; both times are SECONDS.NANOSECONDS
// since the epoch. Empty if the file does not exist, or stat fails.
//
// Programs cannot set the time of change. So changed contents are detected even if length and modification
// time were restored. A file that was copied, moved to another volume or unpacked again has another state.
std::string stateOfFile(const std::string& path) {
    struct stat status {};
    if (::lstat(path.c_str(), &status) != 0) return {};
    return std::to_string(status.st_size) + "," + textOf(status.st_mtim) + "," + textOf(status.st_ctim) +
           "," + std::to_string(status.st_ino);
}

}  // namespace

bool isPath(const std::string& text) noexcept {
    return text.find('\0') == std::string::npos;
}

struct ArtefactRun::Reading {
    explicit Reading(const Platform& services) : platform(withSessions(services, sessions)) {}

    KeptSessions sessions;
    Platform platform;
    std::shared_ptr<PWHashedFile> file;
    std::unique_ptr<DownloadDelegate> controller;

    // For a bundle, whose hashed file does not note it.
    std::optional<URL> executable;
    std::optional<files::ItemState> executableState;
    std::string executableText;  // its state, as a text
};

Kind kindOf(const PWHashedFile& file) {
    if (dynamic_cast<const PWHashedBundle*>(&file) != nullptr) return Kind::bundle;
    if (dynamic_cast<const PWHashedDiskImage*>(&file) != nullptr) return Kind::diskImage;
    if (dynamic_cast<const PWHashedFlatPackage*>(&file) != nullptr) return Kind::package;
    return Kind::none;
}

bool holdsTrailersWithoutTicket(PWHashedFile& file) {
    auto* const package = dynamic_cast<PWHashedFlatPackage*>(&file);
    return package != nullptr && !package->ticketData() && package->hasTrailers();
}

ArtefactRun::ArtefactRun(std::string path, std::uint8_t operation, const Platform& platform)
    : path_(std::move(path)), operation_(operation), platform_(platform) {}

ArtefactRun::~ArtefactRun() = default;

void ArtefactRun::release() {
    reading_.reset();
}

std::optional<Outcome> ArtefactRun::begin() {
    const MessageRedirection redirection([this](std::string line) { messages_.push_back(std::move(line)); });
    return guarded({kExitNoInput, Cause::notReadable}, [this] { return read(); });
}

// An unexpected fault of one artefact must not end the others.
std::optional<Outcome> ArtefactRun::guarded(Outcome ifThrown,
                                            const std::function<std::optional<Outcome>()>& work) {
    try {
        return work();
    } catch (const std::exception& failure) {
        messages_.push_back(values::format("%@ could not be worked on: %@", path_, failure.what()));
        return ifThrown;
    }
}

// Reads the artefact's kind and hash; judges nothing yet.
std::optional<Outcome> ArtefactRun::open(const PWHashedFile::BeforeReading& beforeReading) {
    messages_.clear();
    recordName_.clear();
    filesState_.clear();
    kind_ = Kind::none;
    if (!isPath(path_)) {
        messages_.push_back(values::format("%@ is no path: it holds a zero byte.", path_));
        return Outcome{kExitNoInput, Cause::notReadable};
    }
    reading_ = std::make_unique<Reading>(platform_);
    Reading& reading = *reading_;
    const URL url = URL::fileURLWithPath(path_);
    const std::string stateBeforeReading = stateOfFile(url.path());

    reading.file = PWHashedFile::initWithFileURL(url, reading.platform, beforeReading);
    if (reading.file == nullptr) return Outcome{kExitNoInput, Cause::unsupported};
    kind_ = kindOf(*reading.file);
    if (const int status = reading.file->appropriateExitCode(); status != kExitOK)
        return Outcome{status, status == kExitCannotCreate ? Cause::notWritable : Cause::notReadable};
    if (operation_ == kOperationStaple && holdsTrailersWithoutTicket(*reading.file)) {
        messages_.push_back(values::format(
            "%@ has trailers and no ticket among them: one would be written over its first bytes. "
            "Nothing was written to it.",
            path_));
        return Outcome{kExitCannotCreate, Cause::notWritable};
    }
    filesState_ = stateBeforeReading;
    if (kind_ == Kind::bundle) {
        reading.executable = platform_.files.mainExecutableOfBundle(url);
        if (reading.executable) {
            reading.executableState = platform_.files.stateOfItem(*reading.executable).asOptional();
            reading.executableText = stateOfFile(reading.executable->path());
        }
        filesState_ = stateOfFiles();
    }
    if (const auto hash = codeHashOf(*reading.file)) recordName_ = recordNameForHash(*hash);

    reading.controller = std::make_unique<DownloadDelegate>(reading.file, reading.platform);
    reading.controller->setOperation(operation_);
    return std::nullopt;
}

std::optional<Outcome> ArtefactRun::read() {
    if (const auto ended = open()) return ended;
    Reading& reading = *reading_;
    try {
        if (reading.controller->grabTicket()) return std::nullopt;
    } catch (const RunEnded& ended) {
        return Outcome{ended.status, causeWithoutLookup(ended.status, *reading.file)};
    }
    const int status = reading.file->appropriateExitCode();
    return Outcome{status == kExitOK ? kExitNothingRecorded : status,
                   causeWithoutLookup(status, *reading.file)};
}

std::optional<Outcome> ArtefactRun::end(const Answer& answer) {
    const MessageRedirection redirection([this](std::string line) { messages_.push_back(std::move(line)); });
    return guarded({kExitCannotCreate, Cause::notWritable}, [&] { return write(answer); });
}

std::optional<Outcome> ArtefactRun::write(const Answer& answer) {
    std::unique_ptr<files::ItemLock> lock;
    if (operation_ == kOperationStaple && !lockArtefact(platform_, URL::fileURLWithPath(path_), lock))
        return Outcome{kExitCannotCreate, Cause::notWritable};
    if (!reading_ || !isAsRead()) {
        const std::string asked = std::exchange(recordName_, {});
        if (auto ended = read()) return ended;
        if (recordName_ != asked) return std::nullopt;
    }
    return finish(answer);
}

Outcome ArtefactRun::attach(
    const std::function<base::Result<base::Data>(const std::string& recordName)>& ticketFor) {
    const MessageRedirection redirection([this](std::string line) { messages_.push_back(std::move(line)); });
    return *guarded({kExitCannotCreate, Cause::notWritable}, [&] { return attachUnderLock(ticketFor); });
}

Outcome ArtefactRun::attachUnderLock(
    const std::function<base::Result<base::Data>(const std::string& recordName)>& ticketFor) {
    std::unique_ptr<files::ItemLock> lock;
    if (const auto ended = open([&] { return lockArtefact(platform_, URL::fileURLWithPath(path_), lock); }))
        return *ended;
    if (recordName_.empty()) return {kExitNoInput, Cause::notSigned};
    const auto ticket = ticketFor(recordName_);
    if (!ticket) {
        messages_.push_back(ticket.error().localizedDescription());
        const bool isMissing =
            ticket.error().domain() == base::kPOSIXErrorDomain && ticket.error().code() == ENOENT;
        return isMissing ? Outcome{kExitDataError, Cause::notIssued}
                         : Outcome{kExitNoInput, Cause::notReadable};
    }
    DownloadDelegate& controller = *reading_->controller;
    controller.setTempFileURL(platform_.files.temporaryDirectory().appendingPathComponent(
        runtime::globallyUniqueString() + ".ticket"));
    int status = kExitNothingRecorded;
    try {
        controller.writeDownloadedData(*ticket, nullptr);
        controller.notifyResult();
    } catch (const RunEnded& ended) {
        status = ended.status;
    }
    const Answer none;  // without a lookup
    return {status, causeOf(status, none, *controller.hashedFile())};
}

bool ArtefactRun::isAsRead() const {
    if (!reading_->file->isAsRead()) return false;
    if (!reading_->executable || !reading_->executableState) return true;
    return platform_.files.stateOfItem(*reading_->executable).asOptional() == reading_->executableState;
}

std::optional<Outcome> ArtefactRun::finish(const Answer& answer) {
    messages_.insert(messages_.end(), answer.messages.begin(), answer.messages.end());
    DownloadDelegate& controller = *reading_->controller;
    const std::shared_ptr<KeptSession> lookup = reading_->sessions.last();
    const https::DataCompletion complete = lookup->takeCompletion();
    int status = kExitNoHost;
    try {
        if (answer.error && !answer.errorIsOfAsset) {
            complete(std::nullopt, std::nullopt, answer.error);
        } else {
            complete(answer.body, answer.response, std::nullopt);
        }
        // A large ticket must be downloaded: the controller has made a separate session for it.
        const std::shared_ptr<KeptSession> session = reading_->sessions.last();
        if (session != lookup && session->download() && answer.asset) {
            session->download()->setResponse(answer.asset->response);
            const URL location = platform_.files.temporaryDirectory().appendingPathComponent(
                runtime::globallyUniqueString() + ".download");
            static_cast<void>(platform_.files.writeFile(answer.asset->contents, location,
                                                        files::FileManager::Writing::plain));
            struct Removal {
                files::FileManager& files;
                const URL& file;
                ~Removal() { static_cast<void>(files.removeItem(file)); }
            } const removal{platform_.files, location};
            controller.didFinishDownloading(*session, *session->download(), location);
        } else if (session != lookup && session->download()) {
            controller.didComplete(*session, *session->download(), answer.error.value_or(missingAsset()));
            controller.notifyResult();
        }
    } catch (const RunEnded& ended) {
        status = ended.status;
    }
    const PWHashedFile& file = *controller.hashedFile();
    if (operation_ == kOperationStaple && status == kExitOK) {
        // The read-back showed this state, unless the files have changed since.
        filesState_ = stateOfFiles();
        if (!file.isAsRead()) filesState_.clear();
    }
    return Outcome{status, causeOf(status, answer, file)};
}

// The current state; for a bundle's executable, the state before it was read.
std::string ArtefactRun::stateOfFiles() const {
    const std::string path = URL::fileURLWithPath(path_).path();
    if (kind_ != Kind::bundle) return stateOfFile(path);
    const std::string carrier = stateOfFile(path + "/Contents/CodeResources");
    const std::string& executable = reading_->executableText;
    return carrier.empty() || executable.empty() ? "" : carrier + "+" + executable;
}

}  // namespace pinwell::retrieval
