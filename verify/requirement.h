// Requirements on nested code, as far as they can be told without trusting anybody's certificate.
//
//   designated => identifier "com.example.helper" and cdhash H"0123..."
//
// | Word                  | Meaning                                                                     |
// |-----------------------|-----------------------------------------------------------------------------|
// | identifier TEXT       | the signing identifier                                                      |
// | cdhash H"HEX"         | one of the cdhashes                                                         |
// | always, never         |                                                                             |
// | and, or, !, ( )       | as usual; "and" binds closer than "or"                                      |
// | any other             | cannot be told: it asks for certificates, which are not looked at           |
#pragma once

#include <string_view>

#include "verify/executable.h"

namespace pinwell::verify {

enum class Satisfied { no, unknown, yes };

/// Never throws. What is no requirement, or is nested beyond reason, is `unknown`.
Satisfied satisfies(const CodeIdentity& code, std::string_view requirement);

}  // namespace pinwell::verify
