/* The version of libpinwell-ticket's interface, for its C and its C++ header alike. */
#ifndef PINWELL_TICKET_VERSION_H
#define PINWELL_TICKET_VERSION_H

#define PINWELL_TICKET_VERSION_MAJOR 1
#define PINWELL_TICKET_VERSION_MINOR 0

/* Comparable as a number: 0.1 is 1, 0.2 is 2, 1.0 is 1000. */
#define PINWELL_TICKET_VERSION (PINWELL_TICKET_VERSION_MAJOR * 1000 + PINWELL_TICKET_VERSION_MINOR)

#endif
