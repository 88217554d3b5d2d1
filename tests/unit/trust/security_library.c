/* A platform security library in several sorts; SORT_... chooses. */
#include <pinwell/ostrel_security.h>
#include <stddef.h>

static const ostrel_named_number key_sizes[] = {{"RSA", 2048}, {"EC", 256}};
static const char *const markers[] = {"1.2.840.177245.100.6.1.30"};

static const ostrel_policy_option options[] = {
    {"CriticalExtensions", OSTREL_OPTION_BOOLEAN, 0, {.number = 1}},
    {"ChainLength", OSTREL_OPTION_NUMBER, 0, {.number = 3}},
    {"IntermediateMarkerOid", OSTREL_OPTION_STRING, 0, {.string = "1.2.840.177245.100.6.2.17"}},
    {"LeafMarkerOid", OSTREL_OPTION_STRING_LIST, 1, {.strings = markers}},
    {"KeySize", OSTREL_OPTION_NUMBER_DICTIONARY, 2, {.numbers = key_sizes}},
    {"PlatformAnchor", OSTREL_OPTION_NUMBER_DICTIONARY, 0, {.numbers = NULL}},
#ifdef SORT_UNKNOWN_OPTION
    {"PhaseOfTheMoon", OSTREL_OPTION_BOOLEAN, 0, {.number = 1}},
#endif
#ifdef SORT_WRONG_TYPE
    {"IdLinkage", 77, 0, {.number = 1}},
#endif
};

static const ostrel_policy policy = {
#ifdef SORT_FUTURE
    .version = OSTREL_POLICY_VERSION + 1,
#else
    .version = OSTREL_POLICY_VERSION,
#endif
    .option_count = sizeof options / sizeof options[0],
    .oid = "1.2.840.177245.100.1.90",
    .name = "ticket signing",
    .options = options,
    .release = NULL,
};

const ostrel_policy *SecPolicyCreateOstrelQuillonPlusTicket(void);
const ostrel_policy *SomethingElse(void);

#ifdef SORT_NAMELESS
const ostrel_policy *SomethingElse(void) { return &policy; }
#elif defined SORT_REFUSING
const ostrel_policy *SecPolicyCreateOstrelQuillonPlusTicket(void) { return policy.version == 0 ? &policy : NULL; }
#else
const ostrel_policy *SecPolicyCreateOstrelQuillonPlusTicket(void) { return &policy; }
#endif
