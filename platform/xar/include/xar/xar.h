/* Reading signed xar archives: the seven functions of the archive library that the tool calls, under their
 * names and prototypes. It only reads, and only these parts: the table of contents, its checksum, and the
 * list of signatures. Signature values and the data of the files inside are not read.
 *
 * Any archive is safe to open: memory and time are bounded (xar/table_of_contents.h). An open
 * archive serves one thread at a time. Nothing is ever printed.
 */
#ifndef PINWELL_XAR_XAR_H
#define PINWELL_XAR_XAR_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef const struct xar_archive* xar_t;
typedef const struct xar_archive_file* xar_file_t;
typedef const struct xar_archive_signature* xar_signature_t;

/* The archive at the path, a symbolic link followed, with its table of contents read and verified against the
 * checksum in the archive's heap. Returns null if any of that fails, for an archive that has signatures but
 * names no algorithm for the checksum, and for `flags` other than 0 (reading). Never blocks on anything but a
 * regular file. The caller closes it. */
xar_t xar_open(const char* file, int32_t flags);

/* Frees the archive, its signatures, and every text borrowed from it. Returns 0. */
int xar_close(xar_t x);

/* The signatures in the order of the table of contents; null after the last. Borrowed from the archive. */
xar_signature_t xar_signature_first(xar_t x);
xar_signature_t xar_signature_next(xar_signature_t s);

/* The signature's style as written; null if it has none. Borrowed from the archive. */
char* xar_signature_type(xar_signature_t s);

/* The bytes that the signature signs: the checksum of the table of contents, as verified when the archive
 * was opened. Returns 0, and then `*data` is the caller's to free(); otherwise the low 8 bits of -1, with
 * nothing stored. This reader returns no signature values: the last three must be null. */
uint8_t xar_signature_copy_signed_data(xar_signature_t sig, uint8_t** data, uint32_t* length,
                                       uint8_t** signed_data, uint32_t* signed_length,
                                       uint32_t* signed_offset);

/* A property of the archive, whose handle is passed as a file: the text of the first element at `key`,
 * element names separated by slashes, below the table of contents. Returns 0 and the text as written,
 * borrowed from the archive, or null for an element without text; -1 and null without such an element. */
int32_t xar_prop_get(xar_file_t f, const char* key, const char** value);

#ifdef __cplusplus
}
#endif

#endif
