#include "gate/ticket_directory.h"

#include <algorithm>

#include "codesign/code_error.h"

namespace pinwell::gate {

using codesign::CodeError;

TicketDirectory::TicketDirectory(const std::string& path)
    // The slash makes a link followed: the caller chose the directory.
    : path_(path), directory_(verify::OpenDirectory::atPath(path + "/")) {}

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
