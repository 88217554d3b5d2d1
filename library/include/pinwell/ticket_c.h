/**
 * @file
 * libpinwell-ticket for programs in C, and in every language that can call C.
 *
 * Judges software that carries a Pinwell ticket, checks its bytes against its signature, and finds its ticket. All of
 * it works on this machine alone: no service is asked.
 *
 * @code
 * pinwell_roots *roots;
 * pinwell_result *result;
 * pinwell_error error = PINWELL_ERROR_INIT;
 * if (pinwell_roots_from_directory("/etc/pinwell/platform", PINWELL_NUL_TERMINATED, &roots, &error) != PINWELL_OK ||
 *     pinwell_verify_file("Sample.app", PINWELL_NUL_TERMINATED, roots, NULL, &result, &error) != PINWELL_OK) {
 *     fprintf(stderr, "%s\n", error.message);
 *     return 1;
 * }
 * if (pinwell_result_verdict(result) == PINWELL_VERDICT_GOOD) puts("good");
 * pinwell_result_free(result);
 * pinwell_roots_free(roots);
 * @endcode
 *
 * Shapes. Lengths and offsets are in bytes, integers in host order. A structure begins with `struct_size`, which the
 * caller sets to its sizeof; a later version of this header only adds members at the end. A text that you pass in has a
 * length, or PINWELL_NUL_TERMINATED. A returned text has a length, and ends in a zero byte that the length does not
 * count. Texts from an artefact are returned unchanged: bytes that may hold zeroes and need not be UTF-8. Escape them
 * before you print them.
 *
 * Ownership. A function that fills a handle leaves it to the caller, who frees it with the function of its type; on
 * failure it is NULL. A text or buffer that a function returns from a handle belongs to the handle, and is valid until
 * the handle is freed. Buffers and structures of the caller stay the caller's; the library keeps no pointer to them.
 *
 * Handles are numbers, not addresses. Every function recognises and refuses a handle that is NULL, was freed, or
 * has another type. It returns PINWELL_ERROR_HANDLE, or NULL or 0 if it has no status. A number is not used
 * again.
 *
 * Errors. A function that can fail returns a pinwell_status, and says more in a pinwell_error if it is given one. A
 * fault of an artefact is not an error of pinwell_judge_file() and pinwell_verify_file(): it is their verdict. No
 * exception leaves the library, and it never ends or aborts the process. Treat an unknown number as a refusal of an
 * unknown kind.
 *
 * Threads. Every function may be called from any number of threads at once, with the same handles too. But do not use a
 * text or buffer of a handle after another thread has freed the handle. pinwell_verify_file() starts threads of its
 * own, with all signals blocked, and ends them before it returns. A thread cannot be cancelled while it is in the
 * library. After fork() in a program with several threads, call nothing before exec().
 *
 * The host process. The library prints nothing, writes no file, and leaves signal handlers, locale, environment and
 * working directory alone. Every file that it opens is close-on-exec; a FIFO, a socket or a device is never opened. It
 * stays loaded after dlclose(). To judge a ticket it asks the dynamic loader for libostrelsecurity.so.1, and uses the
 * ticket-signing policy of that library if it exists. libcrypto has environment variables of its own.
 *
 * Versions. A symbol has the version of the interface that added it: PINWELL_TICKET_0.2 and so on. As long as the
 * library is called libpinwell-ticket.so.1, these declarations do not change. They are those of version 0.2: the new
 * name comes from the interface for C++.
 */
#ifndef PINWELL_TICKET_C_H
#define PINWELL_TICKET_C_H

#include <stddef.h>
#include <stdint.h>

#include "pinwell/ticket_version.h"

#if defined(__GNUC__)
#define PINWELL_API __attribute__((visibility("default")))
#else
#define PINWELL_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/** Length of a text that ends in a zero byte. */
#define PINWELL_NUL_TERMINATED SIZE_MAX

/** How a call ended. */
typedef int32_t pinwell_status;
enum {
    PINWELL_OK = 0,
    PINWELL_ERROR_ARGUMENT = 1,        /**< an argument is missing, out of its range, or of a wrong size */
    PINWELL_ERROR_HANDLE = 2,          /**< a handle is NULL, was freed, or is of another type */
    PINWELL_ERROR_MEMORY = 3,          /**< there is not enough memory */
    PINWELL_ERROR_UNREADABLE = 4,      /**< the file cannot be opened or read; `system_error` has the cause if known */
    PINWELL_ERROR_UNSUPPORTED = 5,     /**< the file is of no kind that carries a ticket */
    PINWELL_ERROR_MALFORMED = 6,       /**< the bytes break a rule of their format; `offset` says where */
    PINWELL_ERROR_NO_TICKET = 7,       /**< no ticket is attached */
    PINWELL_ERROR_NOT_SIGNED = 8,      /**< there is no valid signature, so no hash and no record */
    PINWELL_ERROR_NO_CERTIFICATES = 9, /**< the bytes given as roots contain no certificate */
    PINWELL_ERROR_BUFFER = 10,         /**< the buffer is too small; the length is the one needed */
    PINWELL_ERROR_RANGE = 11,          /**< there is no element with this index */
    PINWELL_ERROR_INTERNAL = 12        /**< a fault of the library */
};

/** The kind of an artefact. */
typedef int32_t pinwell_kind;
enum {
    PINWELL_KIND_NONE = 0,       /**< it cannot be read, or is of no kind that carries a ticket */
    PINWELL_KIND_BUNDLE = 1,     /**< a directory with a main executable */
    PINWELL_KIND_EXECUTABLE = 2, /**< an executable image outside a bundle; it has no place for a ticket */
    PINWELL_KIND_DISK_IMAGE = 3,
    PINWELL_KIND_PACKAGE = 4 /**< a signed flat package */
};

/** The verdict on an artefact, in the order of gravity. */
typedef int32_t pinwell_verdict;
enum {
    PINWELL_VERDICT_NONE = 0,       /**< the handle is not a result */
    PINWELL_VERDICT_GOOD = 1,       /**< all checks passed */
    PINWELL_VERDICT_UNREADABLE = 2, /**< it cannot be read, is of no supported kind, or has no valid signature */
    PINWELL_VERDICT_NO_TICKET = 3,  /**< no ticket is attached */
    PINWELL_VERDICT_REFUSED = 4,    /**< the ticket is not genuine, does not list the artefact, or is in a damaged place */
    PINWELL_VERDICT_ALTERED = 5,    /**< something has changed since signing; from pinwell_verify_file() only */
    PINWELL_VERDICT_REVOKED = 6     /**< the ticket is genuine and revokes the software: it must not run */
};

/** The outcome of one check, in the order of gravity. */
typedef int32_t pinwell_outcome;
enum {
    PINWELL_OUTCOME_NONE = 0,
    PINWELL_OUTCOME_PASSED = 1,
    PINWELL_OUTCOME_SKIPPED = 2,    /**< not checked; `found` says why */
    PINWELL_OUTCOME_NOTED = 3,      /**< worth knowing, but not a fault */
    PINWELL_OUTCOME_UNREADABLE = 4, /**< the bytes cannot be read, so their state is unknown */
    PINWELL_OUTCOME_FAILED = 5      /**< something has changed since signing, or breaks a rule */
};

/** Certificates that a ticket's chain may end in. Immutable. */
typedef struct pinwell_roots pinwell_roots;

/** The result of pinwell_judge_file() or pinwell_verify_file(). Immutable. */
typedef struct pinwell_result pinwell_result;

/** A ticket and its place. Immutable. */
typedef struct pinwell_ticket pinwell_ticket;

/** Why a call failed; a successful call does not change it. Optional everywhere: NULL. */
typedef struct pinwell_error {
    size_t struct_size;    /**< set by the caller: sizeof(pinwell_error) */
    pinwell_status status; /**< the status that the call returned */
    int32_t system_error;  /**< errno, or 0 */
    uint64_t offset;       /**< PINWELL_ERROR_MALFORMED: offset in the file of the part that breaks the rule */
    char message[512];     /**< one line in English, for people; control characters are escaped; may be cut */
} pinwell_error;

/** An initialiser for pinwell_error. */
#define PINWELL_ERROR_INIT {sizeof(pinwell_error), PINWELL_OK, 0, 0, {0}}

/** The time of the call. */
#define PINWELL_NOW INT64_MIN

/** Settings of pinwell_judge_file() and pinwell_verify_file(); NULL for those of PINWELL_OPTIONS_INIT. */
typedef struct pinwell_options {
    size_t struct_size;      /**< set by the caller: sizeof(pinwell_options) */
    int64_t evaluation_time; /**< seconds since 1970-01-01 00:00:00 UTC, or PINWELL_NOW; matters only to a policy that
                                  asks for it, which the library's own does not */
    uint32_t threads;        /**< number of reading threads, at most 1024; 0: one for each available processor */
    uint32_t reserved;       /**< 0 */
} pinwell_options;

/** An initialiser for pinwell_options. */
#define PINWELL_OPTIONS_INIT {sizeof(pinwell_options), PINWELL_NOW, 0, 0}

/** One check of an artefact. The texts belong to the result. */
typedef struct pinwell_check {
    size_t struct_size;      /**< set by the caller: sizeof(pinwell_check) */
    pinwell_outcome outcome; /**< its outcome */
    uint32_t depth;          /**< depth of the checked part: 0 for the whole, 1 for its bytes, 2 for nested code... */
    const char *name;        /**< the check's name, such as "page-hashes"; docs/gate.schema.json lists them */
    size_t name_length;
    const char *place; /**< in the artefact: a path, a slice, a page, a range of bytes; empty for the whole */
    size_t place_length;
    const char *expected; /**< the value in the signature; may be empty */
    size_t expected_length;
    const char *found; /**< the value of the bytes; may be empty */
    size_t found_length;
} pinwell_check;

/** An initialiser for pinwell_check. */
#define PINWELL_CHECK_INIT {sizeof(pinwell_check), PINWELL_OUTCOME_NONE, 0, NULL, 0, NULL, 0, NULL, 0, NULL, 0}

/** The PINWELL_TICKET_VERSION of the loaded library. */
PINWELL_API uint32_t pinwell_version(void);

/** The meaning of a status: one line in English, in static memory. Never NULL. */
PINWELL_API const char *pinwell_error_text(pinwell_status status);

/** "bundle", "executable", "diskImage", "package"; "none" for any other number. In static memory. */
PINWELL_API const char *pinwell_kind_text(pinwell_kind kind);

/** "good", "unreadable", "noTicket", "refused", "altered", "revoked"; "none" for any other number. In static memory. */
PINWELL_API const char *pinwell_verdict_text(pinwell_verdict verdict);

/** "passed", "skipped", "noted", "unreadable", "failed"; "none" for any other number. In static memory. */
PINWELL_API const char *pinwell_outcome_text(pinwell_outcome outcome);

/**
 * Roots from the certificates of a PEM text (other blocks are skipped), or from one certificate in DER.
 *
 * @param bytes  not NULL, unless `length` is 0
 * @return PINWELL_OK, PINWELL_ERROR_NO_CERTIFICATES, _ARGUMENT, _MEMORY
 */
PINWELL_API pinwell_status pinwell_roots_from_certificates(const void *bytes, size_t length, pinwell_roots **roots,
                                                           pinwell_error *error);

/**
 * The roots of pinwell(1) if $PINWELL_PLATFORM names this directory: its roots/, without the distrusted ones in
 * user-trust/deny/. Read now, once. An unreadable file is left out, and a directory that does not exist counts as an
 * empty one: see pinwell_roots_count() and pinwell_roots_problem().
 *
 * @return PINWELL_OK, PINWELL_ERROR_ARGUMENT, _MEMORY
 */
PINWELL_API pinwell_status pinwell_roots_from_directory(const char *path, size_t path_length, pinwell_roots **roots,
                                                        pinwell_error *error);

/** How many certificates a chain may end in. Without any, no ticket is genuine. */
PINWELL_API size_t pinwell_roots_count(const pinwell_roots *roots);

/** How many files of the directory were left out. */
PINWELL_API size_t pinwell_roots_problem_count(const pinwell_roots *roots);

/** A line that names such a file; NULL if there is none with this index. `length` may be NULL, here and below. */
PINWELL_API const char *pinwell_roots_problem(const pinwell_roots *roots, size_t index, size_t *length);

/** Returns PINWELL_ERROR_HANDLE if the handle is unknown. NULL has no effect, and is no error. */
PINWELL_API pinwell_status pinwell_roots_free(pinwell_roots *roots);

/**
 * Judges the ticket that is attached to an artefact: the offline half of `pinwell validate`.
 *
 * The verdict is about the hash that the artefact's signature states, not about each byte: see
 * pinwell_verify_file().
 *
 * @param path     of a bundle or a file, relative to the working directory; a link in its last component is not
 *                 followed
 * @param options  may be NULL
 * @return PINWELL_OK with any verdict; PINWELL_ERROR_ARGUMENT, _HANDLE, _MEMORY
 */
PINWELL_API pinwell_status pinwell_judge_file(const char *path, size_t path_length, const pinwell_roots *roots,
                                              const pinwell_options *options, pinwell_result **result,
                                              pinwell_error *error);

/**
 * Judges the ticket, and checks every byte of the artefact against its signature, like `pinwell-gate --offline`.
 *
 * Reads every byte once. Memory is in proportion to the signature and its list of covered files, not to the artefact.
 * Arguments and return values are those of pinwell_judge_file().
 */
PINWELL_API pinwell_status pinwell_verify_file(const char *path, size_t path_length, const pinwell_roots *roots,
                                               const pinwell_options *options, pinwell_result **result,
                                               pinwell_error *error);

PINWELL_API pinwell_kind pinwell_result_kind(const pinwell_result *result);
PINWELL_API pinwell_verdict pinwell_result_verdict(const pinwell_result *result);

/** The exit status of the programs for the verdict: 0, 65, 66 or 77; 70 if the handle is not a result. */
PINWELL_API int32_t pinwell_result_exit_status(const pinwell_result *result);

/** The verdict and its reason: one line in English, for people. */
PINWELL_API const char *pinwell_result_reason(const pinwell_result *result, size_t *length);

/** The name of the record that holds the artefact's ticket; empty without a valid signature. */
PINWELL_API const char *pinwell_result_record_name(const pinwell_result *result, size_t *length);

/** The artefact's hash that a ticket must list, 20 or 48 bytes; NULL without a valid signature. */
PINWELL_API const unsigned char *pinwell_result_code_hash(const pinwell_result *result, size_t *length);

/** The digest type of that hash: 1 SHA-1, 2 and 3 SHA-256, 4 SHA-384; 0 if unknown. */
PINWELL_API uint32_t pinwell_result_digest_type(const pinwell_result *result);

/** The attached ticket, genuine or not; NULL if there is none. */
PINWELL_API const unsigned char *pinwell_result_ticket(const pinwell_result *result, size_t *length);

/** The number of checks: of the ticket, and after pinwell_verify_file() of the bytes. */
PINWELL_API size_t pinwell_result_check_count(const pinwell_result *result);

/**
 * One of the checks. The checks of a part come before the checks of its own parts.
 *
 * @param check  its `struct_size` is set by the caller
 * @return PINWELL_OK, PINWELL_ERROR_HANDLE, _ARGUMENT, _RANGE
 */
PINWELL_API pinwell_status pinwell_result_check(const pinwell_result *result, size_t index, pinwell_check *check);

/** As pinwell_roots_free(). */
PINWELL_API pinwell_status pinwell_result_free(pinwell_result *result);

/**
 * Finds the ticket that is attached to an artefact. It need not be genuine.
 *
 * @return PINWELL_OK, PINWELL_ERROR_UNREADABLE, _UNSUPPORTED, _MALFORMED, _NO_TICKET, _ARGUMENT, _MEMORY
 */
PINWELL_API pinwell_status pinwell_find_ticket(const char *path, size_t path_length, pinwell_ticket **ticket,
                                               pinwell_error *error);

/** The ticket's bytes; never NULL for a ticket. */
PINWELL_API const unsigned char *pinwell_ticket_bytes(const pinwell_ticket *ticket, size_t *length);

/** The absolute path of the file with the ticket: Contents/CodeResources of a bundle, or the artefact itself. */
PINWELL_API const char *pinwell_ticket_file(const pinwell_ticket *ticket, size_t *length);

/** The offset of the ticket in that file. */
PINWELL_API uint64_t pinwell_ticket_offset(const pinwell_ticket *ticket);

/** As pinwell_roots_free(). */
PINWELL_API pinwell_status pinwell_ticket_free(pinwell_ticket *ticket);

/** A buffer of this size is large enough for every record name. */
#define PINWELL_RECORD_NAME_SIZE 144

/**
 * The name of the record that holds the ticket for a hash, such as "2/2/" and 40 hexadecimal digits.
 *
 * @param digest_type  as pinwell_result_digest_type()
 * @param hash         of 1 to 64 bytes
 * @param buffer       gets the name and a zero byte; may be NULL if `buffer_size` is 0
 * @param length       gets the length of the name, without the zero byte, even if the buffer is too small; may be NULL
 * @return PINWELL_OK, PINWELL_ERROR_BUFFER, _ARGUMENT, _MEMORY
 */
PINWELL_API pinwell_status pinwell_record_name(uint32_t digest_type, const void *hash, size_t hash_length, char *buffer,
                                               size_t buffer_size, size_t *length, pinwell_error *error);

/**
 * The name of the record that holds the ticket for an artefact. Buffer and length are as for pinwell_record_name().
 *
 * @return PINWELL_OK, PINWELL_ERROR_BUFFER, _UNREADABLE, _UNSUPPORTED, _NOT_SIGNED, _ARGUMENT, _MEMORY
 */
PINWELL_API pinwell_status pinwell_record_name_of_file(const char *path, size_t path_length, char *buffer,
                                                       size_t buffer_size, size_t *length, pinwell_error *error);

#ifdef __cplusplus
}
#endif

#endif
