#include "src/PWHashedFile/PWHashedFile.h"

#include "runtime/signals.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/messages.h"
#include "values/value.h"

namespace pinwell {
namespace {

std::atomic<std::int32_t> lastFailure{kExitNoInput};
static_assert(std::atomic<std::int32_t>::is_always_lock_free, "a signal handler reads it");

}  // namespace

const std::atomic<std::int32_t>& lastRecordedFailure() noexcept {
    return lastFailure;
}

void PWHashedFile::setAppropriateExitCode(std::int32_t code) noexcept {
    appropriateExitCode_ = code;
    if (code != kExitOK) lastFailure = code;
}

PWHashedFile::PWHashedFile(std::optional<URL> fileURL, const Platform& platform)
    : fileURL_(std::move(fileURL)), platform_(platform) {
    // Before a kind reads anything. If the item cannot be held, the first access reports the error.
    if (fileURL_) held_ = platform.files.holdItem(*fileURL_).asOptional().value_or(nullptr);
}

std::shared_ptr<PWHashedFile> PWHashedFile::initWithFileURL(const URL& fileURL, const Platform& platform,
                                                            const BeforeReading& beforeReading) {
    // Held from the first access on, then owned by the object.
    const auto held = platform.files.holdItem(fileURL);
    const auto properties = platform.files.resourceProperties(fileURL);
    if (!properties) {
        MessageLog("File %@ does not exist. %@", fileURL.path(), properties.error());
        auto unreadable = std::make_shared<PWHashedFile>(fileURL, platform);
        unreadable->setAppropriateExitCode(kExitNoInput);
        return unreadable;
    }
    MessageLog("Processing: %@", fileURL.path());
    NoisyLog("Properties are %@", properties->dictionary());

    AssessmentClass kind =
        assessmentClassForUTI(platform.types, properties->typeIdentifier, fileURL.pathExtension());
    if (kind == AssessmentClass::unknown && properties->isDirectory &&
        platform.files.mainExecutableOfBundle(fileURL))
        kind = AssessmentClass::bundle;
    if (kind == AssessmentClass::unknown) {
        MessageLog("Pinwell is incapable of working with %@ files.", properties->localizedTypeDescription);
        return nullptr;
    }
    if (beforeReading && !beforeReading()) {
        auto busy = std::make_shared<PWHashedFile>(fileURL, platform);
        busy->setAppropriateExitCode(kExitCannotCreate);
        return busy;
    }
    return ofKind(kind, fileURL, platform);
}

std::shared_ptr<PWHashedFile> PWHashedFile::ofKind(AssessmentClass kind, const URL& fileURL,
                                                   const Platform& platform) {
    switch (kind) {
        case AssessmentClass::diskImage:
            return std::make_shared<PWHashedDiskImage>(fileURL, platform);
        case AssessmentClass::package:
            return std::make_shared<PWHashedFlatPackage>(fileURL, platform);
        case AssessmentClass::bundle:
        case AssessmentClass::unknown:
            break;
    }
    return std::make_shared<PWHashedBundle>(fileURL, platform);
}

std::optional<Data> PWHashedFile::cached(std::optional<Data>& cache,
                                         std::optional<Data> (PWHashedFile::*hook)()) {
    {
        const std::lock_guard lock(mutex_);
        if (!cache) cache = (this->*hook)().value_or(Data{});
    }
    // Read without the lock: a set cache never changes.
    return cache->empty() ? std::nullopt : cache;
}

std::optional<Data> PWHashedFile::ticketData() {
    return cached(internalTicketData_, &PWHashedFile::_ticketData);
}
std::optional<Data> PWHashedFile::cdHash() {
    return cached(internalCDHash_, &PWHashedFile::_cdHash);
}

bool PWHashedFile::writeNewTicketDataFromURL(const URL& source, ErrorOut error) {
    NoisyLog("Attempting to attach a new ticket to %@. Let's see how that works out.",
             fileURL_->lastPathComponent());
    return common_writeNewTicketDataFromURL(source, false, error);
}

bool PWHashedFile::_deleteExistingTicket(ErrorOut error) {
    NoisyLog("Attempting to delete the existing ticket attatched %@. Let's see how that works out.",
             fileURL_->lastPathComponent());
    return common_writeNewTicketDataFromURL(std::nullopt, true, error);
}

// The copy to work on; `nullopt` if none can be made, and then the write is in place.
std::optional<URL> PWHashedFile::makeWorkingCopy() {
    const auto directory = platform_.files.createReplacementDirectory(*fileURL_);
    if (!directory) {
        NoisyLog("Could not create replacement directory for %@. %@", fileURL_->path(), directory.error());
        return std::nullopt;
    }
    const URL copy = directory->appendingPathComponent(fileURL_->lastPathComponent());
    if (const auto copied = platform_.files.copyItem(*fileURL_, copy); !copied) {
        NoisyLog("Could not copy backup to %@. %@", fileURL_->path(), copied.error());
        // Nothing will be swapped from there, and no other process uses it.
        static_cast<void>(platform_.files.removeItem(*directory));
        return std::nullopt;
    }
    NoisyLog("Cloned %@ to %@", fileURL_->path(), copy.path());
    return copy;
}

Data PWHashedFile::readTicket(const std::optional<URL>& source, std::optional<Error>& held) const {
    if (!source) return {};
    auto contents = platform_.files.contentsOfFile(*source);
    if (contents) return *std::move(contents);
    held = contents.error();
    return {};
}

bool PWHashedFile::refuseNewTicket(const URL& target, std::optional<Error> reason, ErrorOut error) {
    NoisyLog("Cannot add a new ticket to %@. %@", target.lastPathComponent(), reason);
    return failedToWrite(std::move(reason), error);
}

bool PWHashedFile::failedToWrite(std::optional<Error> reason, ErrorOut error) {
    setAppropriateExitCode(kExitCannotCreate);
    if (error != nullptr) *error = std::move(reason);
    return false;
}

void PWHashedFile::noteState() {
    if (!stateWhenRead_) stateWhenRead_ = platform_.files.stateOfItem(*fileURL_);
}

bool PWHashedFile::isAsRead() const {
    if (!stateWhenRead_) return true;
    const auto now = platform_.files.stateOfItem(*fileURL_);
    return now && *stateWhenRead_ && *now == **stateWhenRead_;
}

bool PWHashedFile::refuseChangedFile(const std::optional<URL>& workingCopy) {
    MessageLog("%@ has changed since it was read. Nothing was written to it.", fileURL_->path());
    // A copy that cannot be removed does no harm.
    if (workingCopy) static_cast<void>(platform_.files.removeItem(workingCopy->deletingLastPathComponent()));
    refusedAsChanged_ = true;
    setAppropriateExitCode(kExitCannotCreate);
    return false;
}

bool PWHashedFile::common_writeNewTicketDataFromURL(const std::optional<URL>& source, bool deleteExisting,
                                                    ErrorOut error) {
    const runtime::SignalDeferral uninterrupted;
    const auto cloning = platform_.files.volumeSupportsCloning(*fileURL_);
    const bool canClone = cloning && *cloning;
    const std::optional<URL> copy = canClone ? makeWorkingCopy() : std::nullopt;
    if (!isAsRead()) return refuseChangedFile(copy);

    std::optional<Error> writeError;  // not reported: this driver reports only the swap's error
    if (!_writeNewTicketDataFromURL(source, copy.value_or(*fileURL_), deleteExisting, &writeError))
        return false;
    if (!copy) return true;
    // Checks again: the swap would overwrite changes made since the file was read.
    if (!isAsRead()) return refuseChangedFile(copy);

    std::optional<Error> reported;
    if (const auto replaced = platform_.files.replaceItem(*fileURL_, *copy); replaced) {
        if (const auto trashed = platform_.files.trashItem(*copy); trashed)
            NoisyLog("Successfully trashed %@!!!", *trashed);
    } else {
        NoisyLog("Could not replace %@ with the safetly modified file at %@. %@", fileURL_->path(), *copy,
                 replaced.error());
        reported = replaced.error();
    }
    if (error != nullptr) *error = reported;
    return true;
}

void PWHashedFile::mustOverride(std::string_view operation) const {
    throw InternalInconsistency(
        values::format("You must override %@ in the %@ subclass", operation, className()));
}

std::optional<Data> PWHashedFile::_ticketData() {
    mustOverride("_ticketData");
}
std::optional<Data> PWHashedFile::_cdHash() {
    mustOverride("_cdHash");
}
bool PWHashedFile::_writeNewTicketDataFromURL(const std::optional<URL>&, const URL&, bool, ErrorOut) {
    mustOverride("_writeNewTicketDataFromURL:intoURL:deleteExisting:error:");
}

std::optional<CodeHash> codeHashOf(PWHashedFile& file) {
    if (file.appropriateExitCode() != kExitOK) return std::nullopt;
    std::optional<Data> hash = file.cdHash();
    if (!hash) return std::nullopt;
    return CodeHash{file.digestAlgorithm(), *std::move(hash)};
}

}  // namespace pinwell
