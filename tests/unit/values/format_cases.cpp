// Compiled once for each case, for its diagnosis alone.
#include "values/format.h"

using pinwell::values::format;

struct Undescribed {};

std::string one(std::string_view text, int number, long word, const std::string& unchecked,
                const Undescribed& thing) {
#if defined(PINWELL_CASE_fits)
    return format("%@ %d %ld %s", unchecked, number, word, text) + format("nothing") + format("%%");
#elif defined(PINWELL_CASE_tooFewArguments)
    return format("%d %d", number);
#elif defined(PINWELL_CASE_tooManyArguments)
    return format("%d", number, number);
#elif defined(PINWELL_CASE_textForInteger)
    return format("%d", text);
#elif defined(PINWELL_CASE_integerForText)
    return format("%s", number);
#elif defined(PINWELL_CASE_integerForObject)
    return format("%@", number);
#elif defined(PINWELL_CASE_wordFor32Bits)
    return format("%d", word);
#elif defined(PINWELL_CASE_halfWordFor64Bits)
    return format("%ld", number);
#elif defined(PINWELL_CASE_wideCharacter)
    return format("%c", number);
#elif defined(PINWELL_CASE_unknownLetter)
    return format("%y", number);
#elif defined(PINWELL_CASE_unfinished)
    return format("100%");
#elif defined(PINWELL_CASE_star)
    return format("%*d", number, number);
#elif defined(PINWELL_CASE_lengthBeforeObject)
    return format("%l@", text);
#elif defined(PINWELL_CASE_tooWide)
    return format("%100d", number);
#elif defined(PINWELL_CASE_flaggedPercent)
    return format("%5%");
#elif defined(PINWELL_CASE_notALiteral)
    return format(unchecked, number);
#elif defined(PINWELL_CASE_undescribedObject)
    return format("%@", thing);
#else
    return "no case was chosen";
#endif
}
