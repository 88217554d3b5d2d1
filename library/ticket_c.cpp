// The C interface of <pinwell/ticket_c.h>, on the parts of this folder.
#include "pinwell/ticket_c.h"

#include <cstring>
#include <ctime>
#include <limits>
#include <memory>
#include <utility>

#include "assessment.h"
#include "c_calls.h"
#include "formats/code_hashes.h"
#include "handles.h"

namespace pinwell::library {
namespace {

using Roots = HandleTable<pinwell_roots, ticket::TrustedRoots>;
using Results = HandleTable<pinwell_result, Assessment>;
using Tickets = HandleTable<pinwell_ticket, LocatedTicket>;

constexpr std::uint32_t kMaximumThreads = 1024;
constexpr std::size_t kLongestHash = 64;
constexpr std::int32_t kExitInternal = 70;  // EX_SOFTWARE

const unsigned char* unsignedBytes(const std::byte* bytes) {
    return reinterpret_cast<const unsigned char*>(bytes);
}

Settings settingsFrom(const pinwell_options* options) {
    const pinwell_options chosen = options == nullptr ? pinwell_options PINWELL_OPTIONS_INIT : *options;
    if (chosen.reserved != 0) throw invalid("a reserved option is not 0");
    if (chosen.threads > kMaximumThreads) throw invalid("there are too many threads");
    const bool isNow = chosen.evaluation_time == PINWELL_NOW;
    return {isNow ? std::int64_t{std::time(nullptr)} : chosen.evaluation_time, chosen.threads};
}

pinwell_status assessFile(const char* path, std::size_t length, Depth depth, const pinwell_roots* roots,
                          const pinwell_options* options, pinwell_result** result, pinwell_error* error) {
    empty(result);
    return guarded(error, [&] {
        require(result, "there is no place for the result");
        if (!hasKnownSize(options)) throw invalid("the options are of an unknown size");
        const std::string file = pathFrom(path, length);
        const Settings settings = settingsFrom(options);
        const auto trusted = Roots::shared().find(roots);
        if (trusted == nullptr) throw Failure{PINWELL_ERROR_HANDLE, "the roots are no handle of roots"};
        *result = Results::shared().add(
            std::make_shared<const Assessment>(assess(file, depth, *trusted, settings)));
    });
}

/// Copies a name to the caller's buffer, or reports its length.
void copyOut(const std::string& name, char* buffer, std::size_t size, std::size_t* length) {
    if (length != nullptr) *length = name.size();
    if (buffer == nullptr && size != 0) throw invalid("there is no buffer");
    if (size <= name.size()) throw Failure{PINWELL_ERROR_BUFFER, "the buffer is too small for the name"};
    std::memcpy(buffer, name.c_str(), name.size() + 1);
}

template <class Table, class Handle>
pinwell_status release(Handle* handle) noexcept {
    const Uncancelled uncancelled;
    if (handle == nullptr) return PINWELL_OK;
    return Table::shared().remove(handle) ? PINWELL_OK : PINWELL_ERROR_HANDLE;
}

pinwell_outcome numberOf(verify::Outcome outcome) {
    switch (outcome) {
        case verify::Outcome::passed:
            return PINWELL_OUTCOME_PASSED;
        case verify::Outcome::skipped:
            return PINWELL_OUTCOME_SKIPPED;
        case verify::Outcome::noted:
            return PINWELL_OUTCOME_NOTED;
        case verify::Outcome::unreadable:
            return PINWELL_OUTCOME_UNREADABLE;
        case verify::Outcome::failed:
            break;
    }
    return PINWELL_OUTCOME_FAILED;
}

}  // namespace
}  // namespace pinwell::library

using namespace pinwell::library;

uint32_t pinwell_version(void) {
    return PINWELL_TICKET_VERSION;
}

const char* pinwell_error_text(pinwell_status status) {
    switch (status) {
        case PINWELL_OK:
            return "no error";
        case PINWELL_ERROR_ARGUMENT:
            return "an argument is missing or out of its range";
        case PINWELL_ERROR_HANDLE:
            return "a handle is NULL, was freed, or is of another type";
        case PINWELL_ERROR_MEMORY:
            return "there is not enough memory";
        case PINWELL_ERROR_UNREADABLE:
            return "the file cannot be read";
        case PINWELL_ERROR_UNSUPPORTED:
            return "the file is of no kind that carries a ticket";
        case PINWELL_ERROR_MALFORMED:
            return "the file breaks a rule of its format";
        case PINWELL_ERROR_NO_TICKET:
            return "no ticket is attached";
        case PINWELL_ERROR_NOT_SIGNED:
            return "there is no valid signature";
        case PINWELL_ERROR_NO_CERTIFICATES:
            return "the roots are no certificates";
        case PINWELL_ERROR_BUFFER:
            return "the buffer is too small";
        case PINWELL_ERROR_RANGE:
            return "there is no element with this index";
        case PINWELL_ERROR_INTERNAL:
            return "a fault of the library";
        default:
            return "an unknown status";
    }
}

const char* pinwell_kind_text(pinwell_kind kind) {
    switch (kind) {
        case PINWELL_KIND_BUNDLE:
            return "bundle";
        case PINWELL_KIND_EXECUTABLE:
            return "executable";
        case PINWELL_KIND_DISK_IMAGE:
            return "diskImage";
        case PINWELL_KIND_PACKAGE:
            return "package";
        default:
            return "none";
    }
}

const char* pinwell_verdict_text(pinwell_verdict verdict) {
    switch (verdict) {
        case PINWELL_VERDICT_GOOD:
            return "good";
        case PINWELL_VERDICT_UNREADABLE:
            return "unreadable";
        case PINWELL_VERDICT_NO_TICKET:
            return "noTicket";
        case PINWELL_VERDICT_REFUSED:
            return "refused";
        case PINWELL_VERDICT_ALTERED:
            return "altered";
        case PINWELL_VERDICT_REVOKED:
            return "revoked";
        default:
            return "none";
    }
}

const char* pinwell_outcome_text(pinwell_outcome outcome) {
    switch (outcome) {
        case PINWELL_OUTCOME_PASSED:
            return "passed";
        case PINWELL_OUTCOME_SKIPPED:
            return "skipped";
        case PINWELL_OUTCOME_NOTED:
            return "noted";
        case PINWELL_OUTCOME_UNREADABLE:
            return "unreadable";
        case PINWELL_OUTCOME_FAILED:
            return "failed";
        default:
            return "none";
    }
}

pinwell_status pinwell_roots_from_certificates(const void* bytes, size_t length, pinwell_roots** roots,
                                               pinwell_error* error) {
    empty(roots);
    return guarded(error, [&] {
        require(roots, "there is no place for the roots");
        if (length != 0) require(bytes, "there are no bytes");
        if (length > std::size_t{std::numeric_limits<std::ptrdiff_t>::max()})
            throw invalid("the length is out of range");
        const auto* const first = static_cast<const std::byte*>(bytes);
        auto made = pinwell::ticket::TrustedRoots::fromCertificates({first, length});
        if (!made) throw Failure{PINWELL_ERROR_NO_CERTIFICATES, made.error().message};
        *roots = Roots::shared().add(std::make_shared<const pinwell::ticket::TrustedRoots>(*std::move(made)));
    });
}

pinwell_status pinwell_roots_from_directory(const char* path, size_t path_length, pinwell_roots** roots,
                                            pinwell_error* error) {
    empty(roots);
    return guarded(error, [&] {
        require(roots, "there is no place for the roots");
        const std::string directory = pathFrom(path, path_length);
        *roots = Roots::shared().add(std::make_shared<const pinwell::ticket::TrustedRoots>(
            pinwell::ticket::TrustedRoots::fromPlatformDirectory(directory)));
    });
}

size_t pinwell_roots_count(const pinwell_roots* roots) {
    const Uncancelled uncancelled;
    const auto found = Roots::shared().find(roots);
    return found == nullptr ? 0 : found->size();
}

size_t pinwell_roots_problem_count(const pinwell_roots* roots) {
    const Uncancelled uncancelled;
    const auto found = Roots::shared().find(roots);
    return found == nullptr ? 0 : found->problems().size();
}

const char* pinwell_roots_problem(const pinwell_roots* roots, size_t index, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Roots::shared().find(roots);
    if (found == nullptr || index >= found->problems().size()) return nothing(length);
    return handOut(found->problems()[index], length);
}

pinwell_status pinwell_roots_free(pinwell_roots* roots) {
    return release<Roots>(roots);
}

pinwell_status pinwell_judge_file(const char* path, size_t path_length, const pinwell_roots* roots,
                                  const pinwell_options* options, pinwell_result** result,
                                  pinwell_error* error) {
    return assessFile(path, path_length, Depth::ticket, roots, options, result, error);
}

pinwell_status pinwell_verify_file(const char* path, size_t path_length, const pinwell_roots* roots,
                                   const pinwell_options* options, pinwell_result** result,
                                   pinwell_error* error) {
    return assessFile(path, path_length, Depth::everyByte, roots, options, result, error);
}

pinwell_kind pinwell_result_kind(const pinwell_result* result) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    return found == nullptr ? PINWELL_KIND_NONE : found->kind;
}

pinwell_verdict pinwell_result_verdict(const pinwell_result* result) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    return found == nullptr ? PINWELL_VERDICT_NONE : found->verdict;
}

int32_t pinwell_result_exit_status(const pinwell_result* result) {
    switch (pinwell_result_verdict(result)) {
        case PINWELL_VERDICT_GOOD:
            return 0;
        case PINWELL_VERDICT_UNREADABLE:
            return 66;
        case PINWELL_VERDICT_NO_TICKET:
        case PINWELL_VERDICT_REFUSED:
        case PINWELL_VERDICT_ALTERED:
            return 65;
        case PINWELL_VERDICT_REVOKED:
            return 77;
        default:
            return kExitInternal;
    }
}

const char* pinwell_result_reason(const pinwell_result* result, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    return found == nullptr ? nothing(length) : handOut(found->reason, length);
}

const char* pinwell_result_record_name(const pinwell_result* result, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    return found == nullptr ? nothing(length) : handOut(found->recordName, length);
}

const unsigned char* pinwell_result_code_hash(const pinwell_result* result, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    if (found == nullptr || !found->codeHash) return nothing<unsigned char>(length);
    return unsignedBytes(handOut(*found->codeHash, length));
}

uint32_t pinwell_result_digest_type(const pinwell_result* result) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    return found == nullptr ? 0 : found->digestType;
}

const unsigned char* pinwell_result_ticket(const pinwell_result* result, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    if (found == nullptr || !found->ticket) return nothing<unsigned char>(length);
    return unsignedBytes(handOut(*found->ticket, length));
}

size_t pinwell_result_check_count(const pinwell_result* result) {
    const Uncancelled uncancelled;
    const auto found = Results::shared().find(result);
    return found == nullptr ? 0 : found->checks.size();
}

pinwell_status pinwell_result_check(const pinwell_result* result, size_t index, pinwell_check* check) {
    return guarded(nullptr, [&] {
        require(check, "there is no place for the check");
        if (!hasKnownSize(check)) throw invalid("the check is of an unknown size");
        const auto found = Results::shared().find(result);
        if (found == nullptr) throw Failure{PINWELL_ERROR_HANDLE, {}};
        if (index >= found->checks.size()) throw Failure{PINWELL_ERROR_RANGE, {}};
        const auto& [source, depth] = found->checks[index];
        check->outcome = numberOf(source.outcome);
        check->depth = depth;
        check->name = handOut(source.name, &check->name_length);
        check->place = handOut(source.place, &check->place_length);
        check->expected = handOut(source.expected, &check->expected_length);
        check->found = handOut(source.found, &check->found_length);
    });
}

pinwell_status pinwell_result_free(pinwell_result* result) {
    return release<Results>(result);
}

pinwell_status pinwell_find_ticket(const char* path, size_t path_length, pinwell_ticket** ticket,
                                   pinwell_error* error) {
    empty(ticket);
    return guarded(error, [&] {
        require(ticket, "there is no place for the ticket");
        *ticket = Tickets::shared().add(
            std::make_shared<const LocatedTicket>(findTicket(pathFrom(path, path_length))));
    });
}

const unsigned char* pinwell_ticket_bytes(const pinwell_ticket* ticket, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Tickets::shared().find(ticket);
    return found == nullptr ? nothing<unsigned char>(length) : unsignedBytes(handOut(found->bytes, length));
}

const char* pinwell_ticket_file(const pinwell_ticket* ticket, size_t* length) {
    const Uncancelled uncancelled;
    const auto found = Tickets::shared().find(ticket);
    return found == nullptr ? nothing(length) : handOut(found->file, length);
}

uint64_t pinwell_ticket_offset(const pinwell_ticket* ticket) {
    const Uncancelled uncancelled;
    const auto found = Tickets::shared().find(ticket);
    return found == nullptr ? 0 : found->offset;
}

pinwell_status pinwell_ticket_free(pinwell_ticket* ticket) {
    return release<Tickets>(ticket);
}

pinwell_status pinwell_record_name(uint32_t digest_type, const void* hash, size_t hash_length, char* buffer,
                                   size_t buffer_size, size_t* length, pinwell_error* error) {
    if (length != nullptr) *length = 0;
    return guarded(error, [&] {
        require(hash, "there is no hash");
        if (hash_length == 0 || hash_length > kLongestHash) throw invalid("no hash has this length");
        const auto* const first = static_cast<const std::byte*>(hash);
        copyOut(pinwell::recordNameForHash(digest_type, {first, hash_length}), buffer, buffer_size, length);
    });
}

pinwell_status pinwell_record_name_of_file(const char* path, size_t path_length, char* buffer,
                                           size_t buffer_size, size_t* length, pinwell_error* error) {
    if (length != nullptr) *length = 0;
    return guarded(
        error, [&] { copyOut(recordNameOfFile(pathFrom(path, path_length)), buffer, buffer_size, length); });
}
