#include "codesign/cms_message.h"

#include <algorithm>
#include <chrono>
#include <initializer_list>
#include <string>
#include <string_view>

#include "codesign/code_error.h"

namespace pinwell::codesign {

using base::asBytes;
using base::ByteView;
using ber::Element;
using ber::Reader;
using ber::Work;

namespace {

constexpr std::string_view kSignedDataType = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x02";  // 1.2.840.113549.1.7.2
constexpr std::string_view kKeyIdentifierExtension = "\x55\x1D\x0E";                  // 2.5.29.14

constexpr const char* kMessage = "the signer's message";
constexpr const char* kSigner = "the signer in the message";
constexpr const char* kCertificate = "a certificate in the message";

int readVersion(Reader& reader, std::initializer_list<int> known, const char* what) {
    const ByteView version = reader.expect(ber::kInteger, what).contents;
    const int number = version.size() == 1 ? std::to_integer<int>(version.front()) : -1;
    if (std::ranges::find(known, number) == known.end())
        refuse(std::string(what) + " has an unknown version");
    return number;
}

Reader within(Reader& reader, std::uint8_t tag, Work& work, const char* what) {
    return {reader.expect(tag, what).contents, work};
}

ByteView readInteger(Reader& reader, const char* what) {
    const ByteView number = reader.expect(ber::kInteger, what).contents;
    if (number.empty()) refuse(std::string(what) + " has a number without a digit");
    return number;
}

std::optional<Data> readKeyIdentifier(const Element& extensions, Work& work) {
    Reader outer(extensions.contents, work);
    Reader list = within(outer, ber::kSequence, work, kCertificate);
    outer.finish(kCertificate);
    while (!list.atEnd()) {
        Reader extension = within(list, ber::kSequence, work, kCertificate);
        const ByteView type = extension.expect(ber::kObjectIdentifier, kCertificate).contents;
        if (!ber::isEqual(type, asBytes(kKeyIdentifierExtension))) continue;
        Element value = extension.next(kCertificate);
        if (value.tag != ber::kOctetString) value = extension.expect(ber::kOctetString, kCertificate);
        Reader inner(value.contents, work);
        return base::toData(inner.expect(ber::kOctetString, kCertificate).contents);
    }
    return std::nullopt;
}

// Certificate = { { [0] version, serial number, algorithm, issuer, validity, subject, public key, [1], [2],
//                   [3] extensions }, algorithm, signature }
MessageCertificate parseCertificate(const Element& element, Work& work) {
    Reader certificate(element.contents, work);
    Reader fields = within(certificate, ber::kSequence, work, kCertificate);
    certificate.expect(ber::kSequence, kCertificate);
    certificate.expect(ber::kBitString, kCertificate);
    certificate.finish(kCertificate);

    MessageCertificate found;
    found.whole = element.whole;
    fields.nextIf(ber::context(0), kCertificate);
    found.serialNumber = readInteger(fields, kCertificate);
    fields.expect(ber::kSequence, kCertificate);
    found.issuer = fields.expect(ber::kSequence, kCertificate).whole;
    fields.expect(ber::kSequence, kCertificate);
    fields.expect(ber::kSequence, kCertificate);
    found.publicKey = fields.expect(ber::kSequence, kCertificate).whole;
    fields.nextIf(ber::context(1, false), kCertificate);
    fields.nextIf(ber::context(2, false), kCertificate);
    if (const auto extensions = fields.nextIf(ber::context(3), kCertificate))
        found.keyIdentifier = readKeyIdentifier(*extensions, work);
    fields.finish(kCertificate);
    return found;
}

std::vector<Algorithm> parseDigestAlgorithms(Reader list, Work& work) {
    std::vector<Algorithm> algorithms;
    while (!list.atEnd()) {
        if (algorithms.size() == kMaximumDigestAlgorithms)
            refuse("the signer's message has too many digest algorithms");
        algorithms.push_back(readAlgorithm(list, work, kMessage));
    }
    return algorithms;
}

// Other forms than X.509, which all have a tag, are counted but not parsed: no signer here can have one.
void parseCertificates(const Element& element, Work& work, SignedMessage& into) {
    for (Reader list(element.contents, work); !list.atEnd();) {
        if (into.certificates.size() + into.otherCertificates == kMaximumCertificates)
            refuse("the signer's message has too many certificates");
        const Element certificate = list.next(kCertificate);
        if (certificate.tag == ber::kSequence) {
            into.certificates.push_back(parseCertificate(certificate, work));
        } else if (certificate.tag < ber::context(0) || certificate.tag > ber::context(3)) {
            refuse("a certificate in the message is malformed");
        } else {
            ++into.otherCertificates;
        }
    }
}

MessageSigner parseSigner(Reader fields, Work& work) {
    MessageSigner signer;
    signer.version = readVersion(fields, {1, 3}, kSigner);
    if (const auto byName = fields.nextIf(ber::kSequence, kSigner)) {
        Reader name(byName->contents, work);
        signer.issuer = name.expect(ber::kSequence, kSigner).whole;
        signer.serialNumber = readInteger(name, kSigner);
        name.finish(kSigner);
    } else {
        const Element identifier = fields.next(kSigner);
        if (identifier.tag != ber::context(0) && identifier.tag != ber::context(0, false))
            refuse("the signer in the message is malformed");
        signer.keyIdentifier = ber::octets(identifier, work, kSigner);
    }
    signer.digestAlgorithm = readAlgorithm(fields, work, kSigner);
    signer.signedAttributes = fields.nextIf(ber::context(0), kSigner);
    signer.signatureAlgorithm = readAlgorithm(fields, work, kSigner);
    const Element signature = fields.next(kSigner);
    if ((signature.tag & ~ber::kConstructed) != ber::kOctetString)
        refuse("the signer in the message is malformed");
    signer.signature = ber::octets(signature, work, kSigner);
    signer.unsignedAttributes = fields.nextIf(ber::context(1), kSigner);
    fields.finish(kSigner);
    return signer;
}

void parseContent(Reader fields, Work& work, SignedMessage& into) {
    into.contentType = fields.expect(ber::kObjectIdentifier, kMessage).contents;
    if (const auto content = fields.nextIf(ber::context(0), kMessage)) {
        Reader wrapper(content->contents, work);
        const Element string = wrapper.next(kMessage);
        if ((string.tag & ~ber::kConstructed) != ber::kOctetString)
            refuse("the signer's message is malformed");
        wrapper.finish(kMessage);
        into.content = ber::octets(string, work, kMessage);
    }
    fields.finish(kMessage);
}

}  // namespace

Algorithm readAlgorithm(Reader& reader, Work& work, const char* what) {
    Reader fields = within(reader, ber::kSequence, work, what);
    Algorithm algorithm;
    algorithm.identifier = fields.expect(ber::kObjectIdentifier, what).contents;
    if (!fields.atEnd()) algorithm.parameters = fields.next(what).whole;
    fields.finish(what);
    return algorithm;
}

SignedMessage parseSignedMessage(ByteView bytes) {
    Work work;
    Reader whole(bytes, work);
    Reader info = within(whole, ber::kSequence, work, kMessage);
    whole.finish(kMessage);
    const ByteView type = info.expect(ber::kObjectIdentifier, kMessage).contents;
    if (!ber::isEqual(type, asBytes(kSignedDataType))) refuse("the signer's message is no SignedData");
    Reader wrapper = within(info, ber::context(0), work, kMessage);
    info.finish(kMessage);
    Reader fields = within(wrapper, ber::kSequence, work, kMessage);
    wrapper.finish(kMessage);

    SignedMessage message;
    message.version = readVersion(fields, {1, 3, 4, 5}, kMessage);
    message.digestAlgorithms = parseDigestAlgorithms(within(fields, ber::kSet, work, kMessage), work);
    parseContent(within(fields, ber::kSequence, work, kMessage), work, message);
    if (const auto certificates = fields.nextIf(ber::context(0), kMessage))
        parseCertificates(*certificates, work, message);
    message.hasRevocationLists = fields.nextIf(ber::context(1), kMessage).has_value();
    Reader signers = within(fields, ber::kSet, work, kMessage);
    fields.finish(kMessage);
    if (signers.atEnd()) refuse("the signer's message has no signer");
    message.signer = parseSigner(within(signers, ber::kSequence, work, kSigner), work);
    if (!signers.atEnd()) refuse("the signer's message has more than one signer");
    return message;
}

std::optional<Element> soleValueOf(const Element& attributes, ByteView type, const char* what) {
    Work work;
    std::optional<Element> found;
    std::size_t values = 0;
    std::size_t matches = 0;
    for (Reader list(attributes.contents, work); !list.atEnd();) {
        Reader fields = within(list, ber::kSequence, work, what);
        const bool isWanted = ber::isEqual(fields.expect(ber::kObjectIdentifier, what).contents, type);
        if (isWanted) ++matches;
        for (Reader set = within(fields, ber::kSet, work, what); !set.atEnd();) {
            const Element value = set.next(what);
            if (!isWanted) continue;
            ++values;
            found = value;
        }
        fields.finish(what);
    }
    return matches == 1 && values == 1 ? found : std::nullopt;
}

bool hasAttributeBeside(const Element& attributes, ByteView type, const char* what) {
    Work work;
    for (Reader list(attributes.contents, work); !list.atEnd();) {
        Reader fields = within(list, ber::kSequence, work, what);
        if (!ber::isEqual(fields.expect(ber::kObjectIdentifier, what).contents, type)) return true;
    }
    return false;
}

using values::Date;

namespace {

constexpr const char* kTimeStamp = "the time stamp";

[[noreturn]] void malformedTime() {
    refuse("the time stamp's time is malformed");
}

/// The digits of a time, from the start.
class TimeReader {
  public:
    explicit TimeReader(std::string_view text) : rest_(text) {}

    unsigned digits(std::size_t count) {
        unsigned value = 0;
        for (; count > 0; --count) {
            if (!isDigit()) malformedTime();
            value = 10 * value + static_cast<unsigned>(take() - '0');
        }
        return value;
    }

    // A fraction has at least one digit; trailing zeros are accepted.
    void fractionAndZone() {
        if (!rest_.empty() && rest_.front() == '.') {
            take();
            if (!isDigit()) malformedTime();
            while (isDigit()) take();
        }
        if (rest_ != "Z") malformedTime();
    }

  private:
    bool isDigit() const { return !rest_.empty() && rest_.front() >= '0' && rest_.front() <= '9'; }
    char take() {
        const char first = rest_.front();
        rest_.remove_prefix(1);
        return first;
    }

    std::string_view rest_;
};

Date parseTime(ByteView text) {
    using namespace std::chrono;
    const std::string characters = base::toString(text);
    TimeReader reader(characters);
    // Braces: they evaluate the parts in order.
    const year_month_day date{year(static_cast<int>(reader.digits(4))), month(reader.digits(2)),
                              day(reader.digits(2))};
    const unsigned hour = reader.digits(2);
    const unsigned minute = reader.digits(2);
    const unsigned second = reader.digits(2);
    reader.fractionAndZone();
    if (!date.ok() || hour > 23 || minute > 59 || second > 59) malformedTime();
    const auto moment = sys_days(date) + hours(hour) + minutes(minute) + seconds(second);
    return Date{moment.time_since_epoch().count()};
}

}  // namespace

TimeStamp parseTimeStamp(ByteView bytes) {
    Work work;
    Reader whole(bytes, work);
    Reader fields(whole.expect(ber::kSequence, kTimeStamp).contents, work);
    whole.finish(kTimeStamp);
    const ByteView version = fields.expect(ber::kInteger, kTimeStamp).contents;
    if (version.size() != 1 || version.front() != std::byte{1})
        refuse("the time stamp has an unknown version");
    fields.expect(ber::kObjectIdentifier, kTimeStamp);

    TimeStamp stamp;
    Reader imprint(fields.expect(ber::kSequence, kTimeStamp).contents, work);
    stamp.imprintAlgorithm = readAlgorithm(imprint, work, kTimeStamp);
    stamp.imprint = imprint.expect(ber::kOctetString, kTimeStamp).contents;
    imprint.finish(kTimeStamp);
    fields.expect(ber::kInteger, kTimeStamp);
    stamp.time = parseTime(fields.expect(ber::kGeneralizedTime, kTimeStamp).contents);
    while (!fields.atEnd()) fields.next(kTimeStamp);
    return stamp;
}

}  // namespace pinwell::codesign
