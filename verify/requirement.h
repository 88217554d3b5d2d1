// Requirements on nested code, as far as they can be evaluated without trust in a certificate.
//
//   designated => identifier "com.example.helper" and cdhash H"0123..."
//
// | Word                  | Meaning                                                                     |
// |-----------------------|-----------------------------------------------------------------------------|
// | identifier TEXT       | the signing identifier                                                      |
// | cdhash H"HEX"         | one of the cdhashes                                                         |
// | always, never         |                                                                             |
// | and, or, !, ( )       | as usual; "and" binds closer than "or"                                      |
// | any other             | unknown: it is about certificates, which are not examined                   |
#pragma once

#include <string_view>

#include "verify/code.h"

namespace pinwell::verify {

enum class Satisfied { no, unknown, yes };

/// Never throws. Returns `unknown` for text that is not a requirement, or is nested too deeply.
Satisfied satisfies(const CodeIdentity& code, std::string_view requirement);

}  // namespace pinwell::verify
