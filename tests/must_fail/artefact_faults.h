// Artefacts with one thing wrong in each, around a ticket that is as it should be; and answers of the
// service.
#pragma once

#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "subjects.h"

namespace pinwell::test {

struct ArtefactFault {
    std::string name;
    std::string wrong;
    std::string subject;  // whose hash the ticket lists that the service answers with
    int exit;             // 0 where it is none, and `wrong` says why
    std::function<void(const std::string& path, const IssuedChain&)> write;

    friend void PrintTo(const ArtefactFault& fault, std::ostream* out) { *out << fault.wrong; }
};

std::vector<ArtefactFault> artefactFaults();

struct AnswerFault {
    std::string name;
    std::string wrong;
    int exit;
    std::string body;

    friend void PrintTo(const AnswerFault& fault, std::ostream* out) { *out << fault.wrong; }
};

/// To a package whose stapled ticket is good, and whose good ticket in base64 is this.
std::vector<AnswerFault> answerFaults(const std::string& goodTicket);

}  // namespace pinwell::test
