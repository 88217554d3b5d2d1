/* The C interface of libpinwell-ticket for Node.js, over Node-API: one binary for every version of Node.js from 12 on.
 * Results are copied into objects. So only the handle of the roots stays open, and the collector frees it.
 */
#define NAPI_VERSION 6
#include <node_api.h>
#include <pinwell/ticket_c.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>

/* Sets a member. A failure leaves an exception, which Node.js throws on return. */
static void set(napi_env env, napi_value object, const char *name, napi_value value) {
    napi_set_named_property(env, object, name, value);
}

/* Texts from an artefact need not be UTF-8: what is not becomes the replacement character. */
static napi_value text(napi_env env, const char *bytes, size_t length) {
    napi_value value = NULL;
    napi_create_string_utf8(env, bytes == NULL ? "" : bytes, length, &value);
    return value;
}

static napi_value word(napi_env env, const char *bytes) { return text(env, bytes, NAPI_AUTO_LENGTH); }

static napi_value integer(napi_env env, int64_t number) {
    napi_value value = NULL;
    napi_create_int64(env, number, &value);
    return value;
}

/* The bytes of a path, which is a string or a Buffer; NULL with an exception if it is neither. To be freed. */
static char *path_from(napi_env env, napi_value value, size_t *length) {
    napi_valuetype type;
    bool is_buffer = false;
    void *bytes;
    char *path = NULL;
    if (napi_typeof(env, value, &type) == napi_ok && type == napi_string &&
        napi_get_value_string_utf8(env, value, NULL, 0, length) == napi_ok) {
        path = malloc(*length + 1);
        if (path != NULL) napi_get_value_string_utf8(env, value, path, *length + 1, length);
    } else if (napi_is_buffer(env, value, &is_buffer) == napi_ok && is_buffer &&
               napi_get_buffer_info(env, value, &bytes, length) == napi_ok) {
        path = malloc(*length + 1);
        if (path != NULL) memcpy(path, bytes, *length);
    } else {
        napi_throw_type_error(env, NULL, "the path must be a string or a Buffer");
        return NULL;
    }
    if (path == NULL) napi_throw_error(env, NULL, "there is not enough memory");
    return path;
}

/* Throws an Error with the member `status`. */
static void throw_status(napi_env env, pinwell_status status, const pinwell_error *error) {
    napi_value object;
    if (napi_create_error(env, NULL, word(env, error->message), &object) != napi_ok) return;
    set(env, object, "status", integer(env, status));
    napi_throw(env, object);
}

static void free_roots(napi_env env, void *roots, void *hint) {
    (void)env;
    (void)hint;
    pinwell_roots_free(roots);
}

/* rootsFromDirectory(path) */
static napi_value roots_from_directory(napi_env env, napi_callback_info info) {
    napi_value argument, external = NULL;
    size_t count = 1, length;
    if (napi_get_cb_info(env, info, &count, &argument, NULL, NULL) != napi_ok) return NULL;
    char *path = path_from(env, argument, &length);
    if (path == NULL) return NULL;
    pinwell_error error = PINWELL_ERROR_INIT;
    pinwell_roots *roots;
    const pinwell_status status = pinwell_roots_from_directory(path, length, &roots, &error);
    free(path);
    if (status != PINWELL_OK)
        throw_status(env, status, &error);
    else if (napi_create_external(env, roots, free_roots, NULL, &external) != napi_ok)
        pinwell_roots_free(roots);
    return external;
}

static napi_value check_at(napi_env env, const pinwell_result *result, size_t index) {
    pinwell_check check = PINWELL_CHECK_INIT;
    napi_value object = NULL;
    if (pinwell_result_check(result, index, &check) != PINWELL_OK || napi_create_object(env, &object) != napi_ok)
        return NULL;
    set(env, object, "name", text(env, check.name, check.name_length));
    set(env, object, "place", text(env, check.place, check.place_length));
    set(env, object, "outcome", word(env, pinwell_outcome_text(check.outcome)));
    set(env, object, "expected", text(env, check.expected, check.expected_length));
    set(env, object, "found", text(env, check.found, check.found_length));
    set(env, object, "depth", integer(env, check.depth));
    return object;
}

static napi_value result_object(napi_env env, const pinwell_result *result) {
    napi_value object = NULL, checks = NULL;
    size_t length;
    if (napi_create_object(env, &object) != napi_ok || napi_create_array(env, &checks) != napi_ok) return NULL;
    set(env, object, "kind", word(env, pinwell_kind_text(pinwell_result_kind(result))));
    set(env, object, "verdict", word(env, pinwell_verdict_text(pinwell_result_verdict(result))));
    set(env, object, "exitStatus", integer(env, pinwell_result_exit_status(result)));
    const char *reason = pinwell_result_reason(result, &length);
    set(env, object, "reason", text(env, reason, length));
    const char *name = pinwell_result_record_name(result, &length);
    set(env, object, "recordName", text(env, name, length));
    const size_t count = pinwell_result_check_count(result);
    for (size_t i = 0; i < count; i++) napi_set_element(env, checks, (uint32_t)i, check_at(env, result, i));
    set(env, object, "checks", checks);
    return object;
}

typedef pinwell_status assess(const char *, size_t, const pinwell_roots *, const pinwell_options *, pinwell_result **,
                              pinwell_error *);

static napi_value assess_file(napi_env env, napi_callback_info info, assess *function) {
    napi_value arguments[2];
    size_t count = 2, length;
    void *roots = NULL;
    napi_valuetype type;
    if (napi_get_cb_info(env, info, &count, arguments, NULL, NULL) != napi_ok) return NULL;
    if (napi_typeof(env, arguments[1], &type) != napi_ok || type != napi_external ||
        napi_get_value_external(env, arguments[1], &roots) != napi_ok) {
        napi_throw_type_error(env, NULL, "the roots must be those of rootsFromDirectory");
        return NULL;
    }
    char *path = path_from(env, arguments[0], &length);
    if (path == NULL) return NULL;
    pinwell_error error = PINWELL_ERROR_INIT;
    pinwell_result *result;
    const pinwell_status status = function(path, length, roots, NULL, &result, &error);
    free(path);
    if (status != PINWELL_OK) {
        throw_status(env, status, &error);
        return NULL;
    }
    napi_value object = result_object(env, result);
    pinwell_result_free(result);
    return object;
}

/* judge(path, roots), verify(path, roots) */
static napi_value judge(napi_env env, napi_callback_info info) { return assess_file(env, info, pinwell_judge_file); }
static napi_value verify(napi_env env, napi_callback_info info) { return assess_file(env, info, pinwell_verify_file); }

/* findTicket(path) */
static napi_value find_ticket(napi_env env, napi_callback_info info) {
    napi_value argument, object = NULL, data = NULL;
    size_t count = 1, length;
    if (napi_get_cb_info(env, info, &count, &argument, NULL, NULL) != napi_ok) return NULL;
    char *path = path_from(env, argument, &length);
    if (path == NULL) return NULL;
    pinwell_error error = PINWELL_ERROR_INIT;
    pinwell_ticket *ticket;
    const pinwell_status status = pinwell_find_ticket(path, length, &ticket, &error);
    free(path);
    if (status != PINWELL_OK) {
        throw_status(env, status, &error);
        return NULL;
    }
    if (napi_create_object(env, &object) == napi_ok) {
        const unsigned char *bytes = pinwell_ticket_bytes(ticket, &length);
        if (napi_create_buffer_copy(env, length, bytes, NULL, &data) == napi_ok) set(env, object, "data", data);
        const char *file = pinwell_ticket_file(ticket, &length);
        set(env, object, "file", text(env, file, length));
        set(env, object, "offset", integer(env, (int64_t)pinwell_ticket_offset(ticket)));
    }
    pinwell_ticket_free(ticket);
    return object;
}

NAPI_MODULE_INIT() {
    static const struct {
        const char *name;
        napi_callback function;
    } functions[] = {{"rootsFromDirectory", roots_from_directory},
                     {"judge", judge},
                     {"verify", verify},
                     {"findTicket", find_ticket}};
    for (size_t i = 0; i < sizeof functions / sizeof functions[0]; i++) {
        napi_value function;
        if (napi_create_function(env, functions[i].name, NAPI_AUTO_LENGTH, functions[i].function, NULL, &function) ==
            napi_ok)
            set(env, exports, functions[i].name, function);
    }
    return exports;
}
