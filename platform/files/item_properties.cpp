#include "files/item_properties.h"
#include "foundation/value.h"

namespace pinwell::files {

Dictionary ResourceProperties::dictionary() const {
    return {{"isDirectory", isDirectory},       {"isPackage", isPackage},
            {"isApplication", isApplication},   {"isSymbolicLink", isSymbolicLink},
            {"typeIdentifier", typeIdentifier}, {"localizedTypeDescription", localizedTypeDescription}};
}

Result<ResourceProperties> resourcePropertiesOfItem(const Place& place, const std::string& name,
                                                    const TypeNaming& typeNaming) {
    const auto status = statusOfItem(place);
    if (!status) return status.error();

    ItemFacts facts;
    facts.name = name;
    facts.isDirectory = S_ISDIR(status->st_mode);
    facts.isRegularFile = S_ISREG(status->st_mode);
    facts.isSymbolicLink = S_ISLNK(status->st_mode);
    facts.isExecutable = (status->st_mode & (S_IXUSR | S_IXGRP | S_IXOTH)) != 0;

    const ItemType type = typeNaming(facts);
    return ResourceProperties{facts.isDirectory,    type.isPackage,  type.isApplication,
                              facts.isSymbolicLink, type.identifier, type.localizedDescription};
}

Result<ItemState> stateOfItemAt(const Place& place) {
    const auto status = statusOfItem(place);
    if (!status) return status.error();
    return ItemState{.device = status->st_dev,
                     .inode = status->st_ino,
                     .size = static_cast<std::uint64_t>(status->st_size),
                     .modifiedSeconds = status->st_mtim.tv_sec,
                     .modifiedNanoseconds = status->st_mtim.tv_nsec};
}

Result<bool> itemIsRegularFile(const Place& place) {
    const auto status = statusOfItem(place);
    if (!status) return status.error();
    return S_ISREG(status->st_mode);
}

}  // namespace pinwell::files
