// Disk images, flat packages and bundles on the disk, with what a test needs to know about them: their bytes,
// the hash that a ticket lists for them, and what they look like once a ticket is stapled to them.
//
//   const Artefact image = writeArtefact(signedImage(), directory / "builds/Sample.dmg");
//   serveTicket(sealed(image.payload()));
//   EXPECT_THAT(pinwell({"staple", image.path}), Ended(0, ...));
//   EXPECT_EQ(readFile(image.path), image.stapledWith(ticket));
//
// All of it is laid out by the builders, without the code under test.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "foundation/bytes.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

using foundation::Data;

struct Artefact {
    std::string name;      // a file name with the kind's extension
    std::string contents;  // of the file that the ticket goes to
    std::uint8_t algorithm = 0;
    Data hash;
    /// All of that file with this ticket in place of whatever ticket it had.
    std::function<std::string(const Data& ticket)> stapledWith;
    std::string path = {};  // where it was written last
    Data executable = {};   // a bundle's; empty for what is one file

    /// The hash as lines of the tool show it.
    std::string prettyHash() const;
    /// Lists the hash.
    TicketPayloadBuilder payload() const;

    bool isBundle() const { return !executable.empty(); }
    /// Where the ticket goes: the file itself, or the one in the bundle.
    std::string file() const { return isBundle() ? path + "/Contents/CodeResources" : path; }
    /// For the names of tests: "SignedImage".
    std::string kind() const;
};

/// Bytes without any regularity, the same for every run.
Data irregularData(std::size_t count);

/// An image of `data` that carries an ad-hoc signature of its own: algorithm 2.
Artefact signedImage(const Data& data = irregularData(100'000));

/// An image of `data` that carries none: its hash is the one made up for unsigned images, algorithm 2.
Artefact unsignedImage(const Data& data = irregularData(100'000));

/// A package whose archive has `data` at its end and an SHA-1 checksum, which is its hash: algorithm 1.
Artefact signedPackage(const Data& data = irregularData(100'000));

/// A bundle with an ad-hoc signature, algorithm 2. In place of a ticket it has `data`.
Artefact signedBundle(const Data& data = irregularData(100'000));

/// Writes the file, or the bundle. Throws when it cannot.
Artefact writeArtefact(Artefact artefact, const std::string& path);

}  // namespace pinwell::test
