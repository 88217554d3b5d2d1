// Disk images, flat packages and bundles on the disk, with the facts that tests need: their bytes, the hash
// that a ticket lists for them, and their contents after a staple.
//
//   const Artefact image = writeArtefact(signedImage(), directory / "builds/Sample.dmg");
//   serveTicket(sealed(image.payload()));
//   EXPECT_THAT(pinwell({"staple", image.path}), Ended(0, ...));
//   EXPECT_EQ(readFile(image.path), image.stapledWith(ticket));
//
// The builders make all of it, without the code under test.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "base/bytes.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

using base::Data;

struct Artefact {
    std::string name;      // a file name with the kind's extension
    std::string contents;  // of the file that gets the ticket
    std::uint8_t algorithm = 0;
    Data hash;
    /// The whole file with this ticket instead of any earlier one.
    std::function<std::string(const Data& ticket)> stapledWith;
    std::string path = {};  // the last path it was written to
    Data executable = {};   // a bundle's; empty for a single file

    /// The hash as lines of the tool show it.
    std::string prettyHash() const;
    /// Lists the hash.
    TicketPayloadBuilder payload() const;

    bool isBundle() const { return !executable.empty(); }
    /// The file that gets the ticket: the artefact itself, or a file in the bundle.
    std::string file() const { return isBundle() ? path + "/Contents/CodeResources" : path; }
    /// For the names of tests: "SignedImage".
    std::string kind() const;
};

/// Bytes without any regularity, the same for every run.
Data irregularData(std::size_t count);

/// An image of `data` with an ad-hoc signature: algorithm 2.
Artefact signedImage(const Data& data = irregularData(100'000));

/// An unsigned image of `data`: it has the synthetic hash of unsigned images, algorithm 2.
Artefact unsignedImage(const Data& data = irregularData(100'000));

/// A package whose archive ends with `data`. Its hash is its SHA-1 checksum: algorithm 1.
Artefact signedPackage(const Data& data = irregularData(100'000));

/// A bundle with an ad-hoc signature, algorithm 2. In place of a ticket it has `data`.
Artefact signedBundle(const Data& data = irregularData(100'000));

/// Writes the file, or the bundle. Throws when it cannot.
Artefact writeArtefact(Artefact artefact, const std::string& path);

}  // namespace pinwell::test
