#include "codesign/code_error.h"

#include <cerrno>
#include <utility>

#include "base/byte_io.h"

namespace pinwell::codesign {

using base::ReadFailure;

CodeError asCodeError(const std::runtime_error& failure) {
    if (const auto* const error = dynamic_cast<const CodeError*>(&failure)) return *error;
    if (dynamic_cast<const base::ShortRead*>(&failure) != nullptr) return {kInvalidSignature, failure.what()};
    const auto* const read = dynamic_cast<const ReadFailure*>(&failure);
    if (read == nullptr) throw;
    switch (read->kind()) {
        case ReadFailure::Kind::pastEnd:
            return {kInvalidSignature, failure.what()};
        case ReadFailure::Kind::noRoom:
            return {kIOError, "there is no room to hold the signature"};
        case ReadFailure::Kind::cutShort:
        case ReadFailure::Kind::unreadable:
            break;
    }
    return {kIOError, failure.what()};
}

Status statusOfLookup(std::int64_t reason) {
    switch (reason) {
        case ENOENT:
        case ENOTDIR:
        case ELOOP:  // a link, with O_NOFOLLOW
        case EXDEV:  // a link that leads out of the bundle
        case ENXIO:  // a socket, or a pipe without a writer
            return kStaticCodeNotFound;
        default:
            return kIOError;
    }
}

base::FileSource openCode(const base::Places& places, const std::string& path) {
    auto file = base::FileSource::open(places, path);
    if (file) return *std::move(file);
    const std::int64_t reason = file.error().code();
    // A directory, or anything else but a regular file or a link.
    if (reason == EISDIR || reason == EINVAL) throw CodeError(kStaticCodeNotFound, "not a regular file");
    throw CodeError(statusOfLookup(reason), "cannot open the file");
}

}  // namespace pinwell::codesign
