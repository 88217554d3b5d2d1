// Property lists, in XML and in the binary form: the Info.plist of a bundle.
#include "base/byte_io.h"
#include "base/bytes.h"
#include "costly_input.h"
#include "values/property_list.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using base::ByteWriter;
using base::toData;

bool read(const Data& document) {
    return values::parsePropertyList(document).has_value();
}

std::string number(std::size_t i) {
    return std::to_string(i);
}

std::string xml(const std::string& body) {
    return "<?xml version=\"1.0\" encoding=\"UTF-8\"?><plist version=\"1.0\">" + body + "</plist>";
}

/// A list of document types, as an application has them.
Data control(std::size_t length) {
    const auto entry = [](std::size_t i) {
        return "<dict><key>Name</key><string>Document type of number " + number(i) +
               "</string><key>Extensions</key><array><string>sample" + number(i) +
               "</string></array><key>Rank</key><integer>" + number(i) + "</integer></dict>";
    };
    return toData(xml("<array>" + filled(entry, length) + "</array>"));
}

CostlyInput document(std::string name, std::string cost, bool isTaken,
                     std::function<std::string(std::size_t)> make) {
    return {.name = "PropertyList" + name,
            .cost = std::move(cost),
            .read = read,
            .isTaken = isTaken,
            .costly = [make = std::move(make)](std::size_t length) { return toData(make(length)); },
            .control = control};
}

/// A list in XML with this body.
CostlyInput row(std::string name, std::string cost, bool isTaken,
                std::function<std::string(std::size_t)> body) {
    return document(std::move(name), std::move(cost), isTaken,
                    [body = std::move(body)](std::size_t length) { return xml(body(length)); });
}

/// A binary list, object by object; references of 4 bytes.
class BinaryList {
  public:
    BinaryList() { writer_.text("bplist00"); }

    std::size_t size() const { return writer_.size() + 4 * offsets_.size(); }
    std::size_t count() const { return offsets_.size(); }

    BinaryList& object(const Data& bytes) {
        offsets_.push_back(writer_.size());
        writer_.bytes(bytes);
        return *this;
    }
    BinaryList& objectAt(std::size_t offset) {
        offsets_.push_back(offset);
        return *this;
    }
    std::size_t offsetOf(std::size_t object) const { return offsets_[object]; }

    Data build() const {
        ByteWriter list = writer_;
        const std::uint64_t table = list.size();
        for (const std::size_t offset : offsets_) list.be32(static_cast<std::uint32_t>(offset));
        list.zeros(6).u8(4).u8(4).be64(offsets_.size()).be64(0).be64(table);
        return std::move(list).take();
    }

  private:
    ByteWriter writer_;
    std::vector<std::size_t> offsets_;
};

/// An object with a length of 32 bits, and its references.
Data container(unsigned kind, std::size_t count, const std::function<std::size_t(std::size_t)>& reference,
               std::size_t references) {
    ByteWriter object;
    object.u8(static_cast<std::uint8_t>(kind << 4U | 0xFU)).u8(0x12).be32(static_cast<std::uint32_t>(count));
    for (std::size_t i = 0; i < references; ++i) object.be32(static_cast<std::uint32_t>(reference(i)));
    return std::move(object).take();
}
Data array(std::size_t count, const std::function<std::size_t(std::size_t)>& reference) {
    return container(0xA, count, reference, count);
}
Data dictionary(std::size_t count, const std::function<std::size_t(std::size_t)>& reference) {
    return container(0xD, count, reference, 2 * count);
}
Data contents(unsigned kind, std::size_t length) {
    ByteWriter object;
    object.u8(static_cast<std::uint8_t>(kind << 4U | 0xFU)).u8(0x12).be32(static_cast<std::uint32_t>(length));
    for (std::size_t i = 0; i < length; ++i) object.u8('a');
    return std::move(object).take();
}

CostlyInput binary(std::string name, std::string cost, bool isTaken, std::function<Data(std::size_t)> make) {
    return {.name = "BinaryPropertyList" + name,
            .cost = std::move(cost),
            .read = read,
            .isTaken = isTaken,
            .costly = std::move(make),
            .control = control};
}

}  // namespace

std::vector<CostlyInput> propertyListInputs() {
    using Length = std::size_t;
    constexpr std::size_t kReference = 4;
    return {
        row("Keys", "keys of one dictionary", true,
            [](Length n) {
                return "<dict>" +
                       filled([](std::size_t i) { return "<key>" + number(i) + "</key><true/>"; }, n) +
                       "</dict>";
            }),
        row("OneKey", "one key, over and over", true,
            [](Length n) { return "<dict>" + filled("<key>a</key><dict/>", n) + "</dict>"; }),
        row("CommonPrefix", "keys that differ in their last characters", true,
            [](Length n) {
                const auto member = [](std::size_t i) {
                    return "<key>" + std::string(4096, 'k') + number(i) + "</key><true/>";
                };
                return "<dict>" + filled(member, n) + "</dict>";
            }),
        row("Values", "the shortest values that there are", true,
            [](Length n) { return "<array>" + filled("<true/>", n) + "</array>"; }),
        row("EmptyDictionaries", "values that take far more room in memory", true,
            [](Length n) { return "<array>" + filled("<dict/>", n) + "</array>"; }),
        row("Depth", "arrays inside arrays", false, [](Length n) { return filled("<array>", n); }),
        row("Attributes", "attributes of one element", true,
            [](Length n) {
                return "<true" + filled([](std::size_t i) { return " a" + number(i) + "=''"; }, n) + "/>";
            }),
        row("Names", "names of attributes", true,
            [](Length n) {
                return "<array>" + filled([](std::size_t i) { return "<true a" + number(i) + "=''/>"; }, n) +
                       "</array>";
            }),
        row("UnknownElements", "names of elements that a list does not have", false,
            [](Length n) { return filled([](std::size_t i) { return "<e" + number(i) + "/>"; }, n); }),
        row("References", "characters by their names", true,
            [](Length n) { return "<string>" + filled("&amp;", n) + "</string>"; }),
        row("Digits", "digits of one integer", false,
            [](Length n) { return "<integer>" + filled("9", n) + "</integer>"; }),
        row("Fraction", "digits of one real number", true,
            [](Length n) { return "<real>0." + filled("3", n) + "</real>"; }),
        row("Data", "lines of data", true,
            [](Length n) { return "<data>" + filled("AAAA\n\t", n) + "</data>"; }),
        row("Date", "characters of a date", false,
            [](Length n) { return "<date>" + filled("2", n) + "</date>"; }),
        row("OneComment", "a comment without an end", false,
            [](Length n) { return "<!--" + filled("- ", n); }),
        row("Sections", "marked sections of one text", true,
            [](Length n) { return "<string>" + filled("<![CDATA[]]>", n) + "</string>"; }),
        document("Entities", "entities of entities", false,
                 [](Length n) {
                     std::string all = "<!DOCTYPE plist [<!ENTITY a0 'aaaaaaaaaa'>";
                     for (int i = 1; i < 30; ++i) {
                         const std::string before = "&a" + number(static_cast<std::size_t>(i - 1)) + ";";
                         all += "<!ENTITY a" + std::to_string(i) + " '" + filled(before, 60) + "'>";
                     }
                     return all + "]><plist><string>" + filled("&a29;", n) + "</string></plist>";
                 }),
        document("UndeclaredEntities", "entities behind a document type that is not read", false,
                 [](Length n) {
                     return "<!DOCTYPE plist SYSTEM 'none'><plist><string>" + filled("&a;", n) +
                            "</string></plist>";
                 }),
        binary("Unfolding", "arrays that each use the next one twice", false,
               [](Length n) {
                   BinaryList list;
                   for (std::size_t i = 0; i < 50; ++i)
                       list.object(array(2, [=](std::size_t) { return i + 1; }));
                   list.object(contents(0x5, n));
                   return list.build();
               }),
        binary("SharedText", "one long text, used many times", false,
               [](Length n) {
                   BinaryList list;
                   list.object(array(1000, [](std::size_t) { return 1; })).object(contents(0x5, n - 8192));
                   return list.build();
               }),
        binary("OverlappingText", "texts that are the same bytes", false,
               [](Length n) {
                   BinaryList list;
                   const std::size_t uses = n / 64 / kReference;
                   list.object(array(uses, [](std::size_t i) { return 1 + i; }));
                   list.object(contents(0x6, n / 4));
                   for (std::size_t i = 1; i < uses; ++i) list.objectAt(list.offsetOf(1));
                   return list.build();
               }),
        binary("OverlappingArrays", "arrays that are the same bytes", false,
               [](Length n) {
                   BinaryList list;
                   const std::size_t uses = n / 4 / kReference;
                   list.object(array(uses, [](std::size_t i) { return 1 + i; }));
                   for (std::size_t i = 0; i < uses; ++i) list.objectAt(list.offsetOf(0));
                   return list.build();
               }),
        binary("Cycle", "arrays that hold one another", false,
               [](Length n) {
                   BinaryList list;
                   const std::size_t uses = n / 3 / kReference;
                   list.object(array(uses, [=](std::size_t i) { return i % 2; }));
                   list.object(array(uses, [=](std::size_t i) { return 1 - i % 2; }));
                   return list.build();
               }),
        binary("Values", "references to the shortest value that there is", true,
               [](Length n) {
                   BinaryList list;
                   list.object(array(n / kReference, [](std::size_t) { return 1; }));
                   list.object(toData(std::string_view("\x09", 1)));
                   return list.build();
               }),
        binary("EmptyDictionaries", "values that take far more room in memory", true,
               [](Length n) {
                   BinaryList list;
                   const std::size_t uses = n / (2 * kReference + 1) - 8;
                   list.object(array(uses, [](std::size_t i) { return 1 + i; }));
                   for (std::size_t i = 0; i < uses; ++i) list.object(toData(std::string_view("\xD0", 1)));
                   return list.build();
               }),
        binary("Keys", "keys of one dictionary", true,
               [](Length n) {
                   BinaryList list;
                   const std::size_t uses = n / (3 * kReference + 5) - 8;
                   list.object(dictionary(uses, [=](std::size_t i) { return i < uses ? 1 + i : 1; }));
                   for (std::size_t i = 0; i < uses; ++i) {
                       ByteWriter key;
                       key.u8(0x54).be32(static_cast<std::uint32_t>(i));
                       list.object(key.data());
                   }
                   return list.build();
               }),
        binary("LongKeys", "one long key, used many times", false,
               [](Length n) {
                   BinaryList list;
                   const std::size_t uses = n / 8 / kReference;
                   list.object(dictionary(uses, [](std::size_t) { return 1; })).object(contents(0x5, n / 2));
                   return list.build();
               }),
        binary("Claims", "objects without an offset", false,
               [](Length n) {
                   BinaryList list;
                   list.object(array(n / 2, [](std::size_t) { return 0xFFFFFFFF; }));
                   Data bytes = list.build();
                   bytes.resize(n);
                   return bytes;
               }),
    };
}

}  // namespace pinwell::test
