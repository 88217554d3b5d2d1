#include "gate/ticket_directory.h"

#include <algorithm>

#include "codesign/code_error.h"

namespace pinwell::gate {

using codesign::CodeError;

foundation::Result<TicketDirectory> TicketDirectory::open(const std::string& path) {
    try {
        // The slash makes a link followed: the caller chose the directory.
        return TicketDirectory(path, verify::OpenDirectory::atPath(path + "/"));
    } catch (const CodeError& error) {
        return foundation::Error(foundation::kOSStatusErrorDomain, error.status(), error.what());
    }
}

TicketDirectory::Found TicketDirectory::find(const std::string& recordName) const {
    std::string name = recordName + ".ticket";
    std::replace(name.begin(), name.end(), '/', '-');
    Found found{.file = path_ + "/" + name, .ticket = std::nullopt, .problem = {}};
    try {
        if (!directory_->kindOf(name)) return found;
        const auto file = directory_->file(name);
        if (file->size() > kMaximumTicketFile) {
            found.problem = "it is too long to be a ticket";
        } else {
            found.ticket = file->read(0, static_cast<std::size_t>(file->size()));
        }
    } catch (const CodeError& error) {
        found.problem = error.what();
    }
    return found;
}

}  // namespace pinwell::gate
