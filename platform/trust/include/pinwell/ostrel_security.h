/*
 * The interface between Pinwell and a platform security library, libostrelsecurity.so.1.
 *
 * Such a library exports, under the name of each policy that it knows, one function of the type
 * ostrel_policy_constructor. Pinwell opens the library, calls the function, copies its result and closes the
 * library again. Without the library, or without the function in it, Pinwell uses its built-in policy. If the
 * function exists but returns no usable policy, the check fails.
 *
 * Name of the ticket-signing policy's constructor: SecPolicyCreateOstrelQuillonPlusTicket
 *
 * Ownership: the object belongs to Pinwell until it calls `release` with it, once, before the library is
 * closed. Everything that the object points to must not change until then. With a null `release` the object
 * stays the library's (for example static). Strings are UTF-8 and end with a zero byte.
 *
 * Not usable, so that the check fails: another version; a null `oid`, key, list or list entry where one is
 * required; more than OSTREL_MAXIMUM_OPTIONS options or OSTREL_MAXIMUM_ENTRIES entries; a string longer than
 * OSTREL_MAXIMUM_STRING bytes; an unknown type; the same key twice. A policy with an unknown option key, or a
 * value of another type, is accepted but trusts nothing.
 *
 *   Key                      Type                            Meaning
 *   CriticalExtensions       boolean                         no malformed extension, no critical one unknown
 *   IdLinkage                boolean                         key identifiers link each certificate to its issuer
 *   BasicConstraints         boolean                         each issuer is a CA, within its path length
 *   NonEmptySubject          boolean                         no subject name is empty
 *   ValidityDates            boolean                         no certificate has expired, or is not valid yet
 *   ServerAuthentication     boolean                         the leaf's extended key usage names servers, an
 *                                                            issuer's too, or any purpose, where it has one; the
 *                                                            leaf's key usage, where it has one, allows TLS
 *   NameConstraints          boolean                         the host and all names keep to the issuers' name
 *                                                            constraints
 *   PlatformAnchor           number dictionary, empty        the chain ends at one of the platform's own roots;
 *                                                            also when no anchor option is given
 *   CompatibilityAnchor      number dictionary, empty        the same, or at a compatibility root
 *   ChainLength              number                          certificates in the chain, leaf and root counted
 *   IntermediateMarkerOid    string or string list           extensions that every intermediate carries
 *   LeafMarkerOid            string or string list           extensions that the leaf carries
 *   KeySize                  number dictionary               minimum bits by key type, "RSA" and "EC"; a type that
 *                                                            is not in it is refused
 *   HostName                 string                          DNS name or IP address that the leaf is for
 */
#ifndef PINWELL_OSTREL_SECURITY_H
#define PINWELL_OSTREL_SECURITY_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define OSTREL_POLICY_VERSION 1
#define OSTREL_MAXIMUM_OPTIONS 64
#define OSTREL_MAXIMUM_ENTRIES 64
#define OSTREL_MAXIMUM_STRING 1024

/* Values of ostrel_policy_option.type, and which member of the value each uses. */
#define OSTREL_OPTION_BOOLEAN 1           /* number: 0 or 1 */
#define OSTREL_OPTION_NUMBER 2            /* number */
#define OSTREL_OPTION_STRING 3            /* string */
#define OSTREL_OPTION_STRING_LIST 4       /* strings, `count` of them */
#define OSTREL_OPTION_NUMBER_DICTIONARY 5 /* numbers, `count` of them */

typedef struct ostrel_named_number {
    const char *name;
    int64_t number;
} ostrel_named_number;

typedef struct ostrel_policy_option {
    const char *key;
    uint32_t type;
    uint32_t count; /* entries of a list or dictionary; 0 for the other types */
    union {
        int64_t number;
        const char *string;
        const char *const *strings;         /* may be null when count is 0 */
        const ostrel_named_number *numbers; /* may be null when count is 0 */
    } value;
} ostrel_policy_option;

typedef struct ostrel_policy {
    uint32_t version; /* OSTREL_POLICY_VERSION; stays the first member in every version */
    uint32_t option_count;
    const char *oid;
    const char *name; /* may be null */
    const ostrel_policy_option *options;
    void (*release)(const struct ostrel_policy *policy); /* may be null */
} ostrel_policy;

/* Returns a policy, or null if it refuses. May be called from any thread. */
typedef const ostrel_policy *(*ostrel_policy_constructor)(void);

#ifdef __cplusplus
}
#endif

#endif
