#include "src/type_naming.h"

namespace pinwell {

files::ItemType nameType(types::TypeService& types, const files::ItemFacts& facts) {
    types::Item item{facts.name, types::ItemKind::other, facts.isExecutable};
    if (facts.isSymbolicLink)
        item.kind = types::ItemKind::symbolicLink;
    else if (facts.isDirectory)
        item.kind = types::ItemKind::directory;
    else if (facts.isRegularFile)
        item.kind = types::ItemKind::regularFile;

    files::ItemType type;
    type.identifier = types.typeIdentifier(item);
    type.localizedDescription = types.localizedDescription(item);
    type.isPackage = types.conforms(type.identifier, "com.ostrel.package");
    type.isApplication = types.conforms(type.identifier, "com.ostrel.application");
    return type;
}

}  // namespace pinwell
