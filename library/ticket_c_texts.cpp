// The numbers of <pinwell/ticket_c.h> in words, and the version.
#include "pinwell/ticket_c.h"

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
