// Artefacts with one fault each, around a valid ticket; and responses of the
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
    std::string subject;  // the ticket in the service's response lists its hash
    int exit;             // 0 if it is no fault, and `wrong` gives the reason
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

/// For a package with a valid stapled ticket, which is this in base64.
std::vector<AnswerFault> answerFaults(const std::string& goodTicket);

}  // namespace pinwell::test
