// make_tickets FOLDER: tickets for the example program: the roots that they are judged by, and files with a
// genuine ticket, a forged one and a part of one. The hash that they list is that of hashOf(7).
#include <iostream>

#include "support/disk_image_builder.h"
#include "support/package_builder.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"

int main(int count, char** arguments) {
    using namespace pinwell;
    using namespace pinwell::test;
    if (count != 2) {
        std::cerr << "usage: make_tickets FOLDER\n";
        return 64;
    }
    const std::string folder = std::string(arguments[1]) + "/";
    const IssuedChain chain = TicketChain().issue();
    const SatchelBuilder sound =
        SatchelBuilder::of(chain, TicketPayloadBuilder().entry(2, hashOf(7)).build());
    const Data ticket = sound.build();
    const Data forged = SatchelBuilder(sound).signedBy(SigningKey::cached(KeyKind::p256, "forger")).build();
    const std::string text = base::toString(ticket);

    writeFile(folder + "roots.pem", chain.root.pem());
    writeFile(folder + "platform/roots/root.pem", chain.root.pem());
    writeFile(folder + "genuine.ticket", base::ByteView(ticket));
    writeFile(folder + "forged.ticket", base::ByteView(forged));
    writeFile(folder + "truncated.ticket", base::ByteView(ticket).first(ticket.size() / 2));
    writeFile(
        folder + "genuine.dmg",
        base::ByteView(DiskImageBuilder()
                           .superblob(DiskImageBuilder::signature().blob(kSampleTicketSlot, ticketBlob(text)))
                           .build()));
    writeFile(folder + "genuine.pkg", PackageBuilder().terminator().ticket(text).build());
    writeFile(folder + "bare.pkg", PackageBuilder().build());
}
