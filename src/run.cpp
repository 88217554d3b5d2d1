#include "src/run.h"

#include <cerrno>
#include <memory>

#include "src/DownloadDelegate.h"
#include "src/messages.h"

namespace pinwell {

bool lockArtefact(const Platform& platform, const URL& path, std::unique_ptr<files::ItemLock>& lock) {
    auto locked = platform.files.lockItem(
        path, [&] { NoisyLog("Waiting for another process that keeps %@ locked.", path.path()); });
    if (locked) {
        lock = *std::move(locked);
        return true;
    }
    if (locked.error().code() != EBUSY) return true;
    MessageLog("Another process keeps %@ locked. Nothing was written to it.", path.path());
    return false;
}

int runOperation(std::uint8_t operation, const URL& path, const Platform& platform,
                 const std::function<void()>& waitForEnd) {
    // Taken before anything is read, and held to the end. So a second staple of the artefact begins to read
    // after the first has read back its ticket.
    std::unique_ptr<files::ItemLock> lock;
    const auto hashedFile = PWHashedFile::initWithFileURL(
        path, platform, [&] { return operation != kOperationStaple || lockArtefact(platform, path, lock); });
    if (hashedFile == nullptr) return kExitNoInput;
    if (hashedFile->appropriateExitCode() != kExitOK) return hashedFile->appropriateExitCode();

    DownloadDelegate controller(hashedFile, platform);
    controller.setOperation(operation);
    controller.keepLock(std::move(lock));
    if (controller.grabTicket()) {
        waitForEnd();
        return kExitOK;
    }
    const int code = controller.hashedFile()->appropriateExitCode();
    return code == kExitOK ? kExitNothingRecorded : code;
}

}  // namespace pinwell
