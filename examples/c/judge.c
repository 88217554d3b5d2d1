/* judge PLATFORM PATH...: prints libpinwell-ticket's results for each artefact, one JSON object a line.
 *
 * PLATFORM is a platform directory, such as /etc/pinwell/platform. Ends with 0 if all artefacts are unchanged since
 * signing and have a good ticket, with 65 if not, and with 64 or 70 after another error.
 *
 *   cc -std=c99 judge.c $(pkg-config --cflags --libs pinwell-ticket) -o judge
 */
#include <inttypes.h>
#include <pinwell/ticket_c.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

enum { EXIT_NOT_GOOD = 65, EXIT_USAGE = 64, EXIT_INTERNAL = 70 };

/* Bytes as a JSON text. Those that are not ASCII are shown as if they were Latin-1: they need not be UTF-8. */
static void print_text(const char *text, size_t length) {
    putchar('"');
    for (size_t i = 0; i < length; i++) {
        const unsigned char byte = (unsigned char)text[i];
        if (byte == '"' || byte == '\\')
            printf("\\%c", byte);
        else if (byte < 0x20 || byte >= 0x7f)
            printf("\\u%04x", byte);
        else
            putchar(byte);
    }
    putchar('"');
}

static void print_word(const char *word) { print_text(word, strlen(word)); }

static void print_verdict(const pinwell_result *result) {
    size_t length;
    const char *reason = pinwell_result_reason(result, &length);
    printf("{\"verdict\": ");
    print_word(pinwell_verdict_text(pinwell_result_verdict(result)));
    printf(", \"exitStatus\": %" PRId32 ", \"reason\": ", pinwell_result_exit_status(result));
    print_text(reason, length);
}

static void print_failed(const pinwell_result *result) {
    const char *separator = "";
    printf(", \"failed\": [");
    for (size_t i = 0; i < pinwell_result_check_count(result); i++) {
        pinwell_check check = PINWELL_CHECK_INIT;
        if (pinwell_result_check(result, i, &check) != PINWELL_OK) break;
        if (check.outcome < PINWELL_OUTCOME_UNREADABLE) continue;
        printf("%s[", separator);
        print_text(check.name, check.name_length);
        printf(", ");
        print_text(check.place, check.place_length);
        printf("]");
        separator = ", ";
    }
    printf("]");
}

static void print_ticket(const char *path) {
    pinwell_ticket *ticket;
    const pinwell_status status = pinwell_find_ticket(path, PINWELL_NUL_TERMINATED, &ticket, NULL);
    printf(", \"ticket\": {\"status\": %" PRId32, status);
    if (status == PINWELL_OK) {
        size_t length;
        const char *file = pinwell_ticket_file(ticket, &length);
        printf(", \"file\": ");
        print_text(file, length);
        pinwell_ticket_bytes(ticket, &length);
        printf(", \"offset\": %" PRIu64 ", \"length\": %zu", pinwell_ticket_offset(ticket), length);
        pinwell_ticket_free(ticket);
    }
    printf("}");
}

/* Returns whether the artefact is good; ends the program if it cannot be judged. */
static int show(const char *path, const pinwell_roots *roots) {
    pinwell_error error = PINWELL_ERROR_INIT;
    pinwell_result *judged, *verified;
    if (pinwell_judge_file(path, PINWELL_NUL_TERMINATED, roots, NULL, &judged, &error) != PINWELL_OK ||
        pinwell_verify_file(path, PINWELL_NUL_TERMINATED, roots, NULL, &verified, &error) != PINWELL_OK) {
        fprintf(stderr, "judge: %s\n", error.message);
        exit(EXIT_INTERNAL);
    }
    char name[PINWELL_RECORD_NAME_SIZE];
    size_t length = 0;
    if (pinwell_record_name_of_file(path, PINWELL_NUL_TERMINATED, name, sizeof name, &length, NULL) != PINWELL_OK)
        length = 0;

    printf("{\"path\": ");
    print_word(path);
    printf(", \"kind\": ");
    print_word(pinwell_kind_text(pinwell_result_kind(judged)));
    printf(", \"recordName\": ");
    print_text(name, length);
    printf(", \"judge\": ");
    print_verdict(judged);
    printf("}, \"verify\": ");
    print_verdict(verified);
    print_failed(verified);
    printf("}");
    print_ticket(path);
    printf("}\n");

    const int good = pinwell_result_verdict(verified) == PINWELL_VERDICT_GOOD;
    pinwell_result_free(judged);
    pinwell_result_free(verified);
    return good;
}

int main(int count, char **arguments) {
    if (count < 3) {
        fprintf(stderr, "usage: judge PLATFORM PATH...\n");
        return EXIT_USAGE;
    }
    pinwell_error error = PINWELL_ERROR_INIT;
    pinwell_roots *roots;
    if (pinwell_roots_from_directory(arguments[1], PINWELL_NUL_TERMINATED, &roots, &error) != PINWELL_OK) {
        fprintf(stderr, "judge: %s\n", error.message);
        return EXIT_INTERNAL;
    }
    if (pinwell_roots_count(roots) == 0) fprintf(stderr, "judge: there are no roots in %s\n", arguments[1]);
    int all_good = 1;
    for (int i = 2; i < count; i++) all_good &= show(arguments[i], roots);
    pinwell_roots_free(roots);
    return all_good ? 0 : EXIT_NOT_GOOD;
}
