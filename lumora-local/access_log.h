// One line for each request: for people, or as JSON for programs.
#pragma once

#include <chrono>
#include <string>
#include <string_view>
#include <vector>

#include "values/date.h"

namespace pinwell::lumora {

enum class LogForm {
    text,
    json,  ///< one object a line, everything on standard output
};

/// A request with its response. Texts are as the client sent them.
struct RequestEntry {
    values::Date time;
    std::string_view peer;
    std::string_view client;  // common name of its certificate; empty if the server requests none
    std::string_view method;  // empty if the head is unreadable
    std::string_view target;
    int status = 0;
    std::size_t size = 0;                               // of the response's body
    std::string_view identifier;                        // as in X-Ostrel-Request-UUID
    const std::vector<std::string>* records = nullptr;  // the looked-up names; may be null
    std::chrono::microseconds duration{};               // from the first byte until the response is ready
};

/// Without a newline.
std::string describeRequest(const RequestEntry& entry, LogForm form);

/// A line about the service itself: {"time", "level", "message"}. `level` is info or error.
std::string messageAsJson(values::Date time, std::string_view level, std::string_view message);

}  // namespace pinwell::lumora
