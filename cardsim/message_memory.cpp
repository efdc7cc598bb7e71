#include "cardsim/message_memory.h"

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <sstream>
#include <vector>

#include "cardsim/arguments.h"
#include "cardsim/card_engine.h"
#include "support/gsm.h"
#include "support/text.h"

namespace vqm::cardsim {

namespace {

// 27.005 error codes the card answers with.
constexpr const char* kNotAllowed = "+CMS ERROR: 302";
constexpr const char* kBadPduParameter = "+CMS ERROR: 304";
constexpr const char* kBadTextParameter = "+CMS ERROR: 305";
constexpr const char* kInvalidIndex = "+CMS ERROR: 321";
constexpr const char* kMemoryFull = "+CMS ERROR: 322";
constexpr const char* kCentreUnknown = "+CMS ERROR: 330";
// The service centre stored on the simulated SIM.
constexpr const char* kSimCentre = "+3097100000";

constexpr int kMaxCapacity = 255;

const char* const kStatWords[] = {"REC UNREAD", "REC READ", "STO UNSENT", "STO SENT"};

bool StartsWith(const std::string& text, const std::string& prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

std::string Hex(const uint8_t* bytes, size_t count) {
    static const char kDigits[] = "0123456789ABCDEF";
    std::string out;
    for (size_t i = 0; i < count; ++i) {
        out.push_back(kDigits[bytes[i] >> 4]);
        out.push_back(kDigits[bytes[i] & 0xF]);
    }
    return out;
}

std::string HexOctet(int value) {
    const uint8_t byte = static_cast<uint8_t>(value);
    return Hex(&byte, 1);
}

bool HexBytes(const std::string& hex, std::vector<uint8_t>* out) {
    if (hex.empty() || hex.size() % 2 != 0) return false;
    out->resize(hex.size() / 2);
    const int count =
        HexToBytes(hex.data(), static_cast<int>(hex.size()), out->data(), out->size());
    return static_cast<size_t>(count) == out->size();
}

// One field of an AT argument list: quoted text keeps its case and commas.
using Field = Argument;

// The card's one argument splitter (cardsim/arguments.h); no parameters are no fields. The
// engine refuses parameters that do not split before they get here.
std::vector<Field> Fields(const std::string& args) {
    std::vector<Field> fields;
    if (!SplitArguments(args, &fields) || args.empty()) fields.clear();
    return fields;
}

// A whole number field within [low, high].
bool Number(const Field& field, int low, int high, int* value) {
    if (field.quoted || field.text.empty()) return false;
    char* end = nullptr;
    const long parsed = std::strtol(field.text.c_str(), &end, 10);
    if (*end != '\0' || parsed < low || parsed > high) return false;
    *value = static_cast<int>(parsed);
    return true;
}

bool IsDialNumber(const std::string& number) {
    const size_t start = !number.empty() && number[0] == '+' ? 1 : 0;
    const size_t digits = number.size() - start;
    return digits >= 1 && digits <= 20 &&
           number.find_first_not_of("0123456789*#", start) == std::string::npos;
}

// An address field: digit count, type and the swapped semi-octets.
std::string EncodeAddress(const std::string& number, bool forCentre) {
    const bool international = !number.empty() && number[0] == '+';
    std::string digits = number.substr(international ? 1 : 0);
    std::string semi;
    for (char c : digits)
        semi.push_back(c == '*' ? 'A' : c == '#' ? 'B' : c);
    if (semi.size() % 2) semi.push_back('F');
    for (size_t i = 0; i + 1 < semi.size(); i += 2)
        std::swap(semi[i], semi[i + 1]);
    // The centre's length counts octets with the type; an address's counts digits.
    const size_t length = forCentre ? 1 + semi.size() / 2 : digits.size();
    return HexOctet(static_cast<int>(length)) + (international ? "91" : "81") + semi;
}

std::string DecodeAddress(const uint8_t* field, int digits, int type) {
    if ((type & 0x70) == 0x50) {  // alphanumeric: packed septets
        char codes[24], shown[24];
        const std::string hex = Hex(field, static_cast<size_t>((digits + 1) / 2));
        const int count = UnpackSeptets(hex.data(), static_cast<int>(hex.size()), codes,
                                        sizeof codes, digits * 4 / 7);
        GsmToDisplay(codes, count, shown, sizeof shown);
        return shown;
    }
    static const char kSemi[] = "0123456789*#abc";
    std::string number = (type & 0x70) == 0x10 ? "+" : "";
    for (int i = 0; i < digits; ++i) {
        const int nibble = (i % 2 == 0) ? field[i / 2] & 0xF : field[i / 2] >> 4;
        if (nibble == 0xF) break;
        number.push_back(kSemi[nibble]);
    }
    return number;
}

// The alphabet a data coding scheme selects (23.038 section 4): 0 GSM 7-bit, 1 8-bit, 2 UCS2.
int Alphabet(int dcs) {
    if ((dcs & 0x80) == 0) return (dcs & 0x20) ? 1 : ((dcs >> 2) & 3) == 3 ? 1 : (dcs >> 2) & 3;
    switch (dcs & 0xF0) {
        case 0xC0:
        case 0xD0:
            return 0;
        case 0xE0:
            return 2;
        case 0xF0:
            return (dcs & 0x04) ? 1 : 0;
        default:
            return 1;
    }
}

std::string StampText(const uint8_t* s) {
    auto field = [](uint8_t b) { return (b & 0xF) * 10 + (b >> 4); };
    const int quarters = (s[6] & 0x07) * 10 + (s[6] >> 4);
    char text[32];
    std::snprintf(text, sizeof text, "%02d/%02d/%02d,%02d:%02d:%02d%c%02d", field(s[0]) % 100,
                  field(s[1]) % 100, field(s[2]) % 100, field(s[3]) % 100, field(s[4]) % 100,
                  field(s[5]) % 100, (s[6] & 0x08) ? '-' : '+', quarters % 100);
    return text;
}

std::string StampHex(const std::tm& when, long offsetSeconds) {
    auto octet = [](int v) { return static_cast<uint8_t>(((v % 10) << 4) | ((v / 10) % 10)); };
    const long quarters = (offsetSeconds < 0 ? -offsetSeconds : offsetSeconds) / 900;
    uint8_t s[7] = {octet(when.tm_year % 100),
                    octet(when.tm_mon + 1),
                    octet(when.tm_mday),
                    octet(when.tm_hour),
                    octet(when.tm_min),
                    octet(when.tm_sec),
                    octet(static_cast<int>(quarters))};
    if (offsetSeconds < 0) s[6] |= 0x08;
    return Hex(s, sizeof s);
}

// A PDU as the card checks and shows it: centre address, then an SMS-DELIVER or SMS-SUBMIT.
struct Tpdu {
    int type = -1;   // 0 SMS-DELIVER, 1 SMS-SUBMIT
    int octets = 0;  // without the centre address
    bool centreGiven = false;
    std::string number;
    int coding = 0;
    std::string stamp;  // "yy/MM/dd,hh:mm:ss+zz" for a delivered message
    int userDataLength = 0;
    std::string userData;  // hexadecimal
};

bool Decode(const std::string& hex, Tpdu* pdu) {
    std::vector<uint8_t> b;
    if (!HexBytes(hex, &b) || b[0] > 11) return false;
    const size_t size = b.size();
    size_t at = 1 + b[0];
    if (at >= size) return false;
    pdu->centreGiven = b[0] > 0;
    pdu->octets = static_cast<int>(size - at);
    const uint8_t firstOctet = b[at++];
    pdu->type = firstOctet & 0x03;
    if (pdu->type == 1) {
        ++at;  // message reference
    } else if (pdu->type != 0) {
        return false;
    }
    if (at + 2 > size) return false;
    const int digits = b[at], type = b[at + 1];
    at += 2;
    const size_t fieldOctets = static_cast<size_t>(digits + 1) / 2;
    if (digits > 20 || at + fieldOctets > size) return false;
    pdu->number = DecodeAddress(&b[at], digits, type);
    at += fieldOctets;
    if (at + 2 > size) return false;
    pdu->coding = b[at + 1];
    at += 2;
    if (pdu->type == 0) {
        if (at + 7 > size) return false;
        pdu->stamp = StampText(&b[at]);
        at += 7;
    } else {
        const int validityFormat = (firstOctet >> 3) & 3;
        at += validityFormat == 2 ? 1 : validityFormat == 0 ? 0 : 7;
    }
    if (at >= size) return false;
    pdu->userDataLength = b[at++];
    const bool septets = Alphabet(pdu->coding) == 0;
    if (pdu->userDataLength > (septets ? 160 : 140)) return false;
    const size_t expected =
        septets ? (static_cast<size_t>(pdu->userDataLength) * 7 + 7) / 8 : pdu->userDataLength;
    if (size - at != expected) return false;
    pdu->userData = Hex(b.data() + at, expected);
    return true;
}

// The body as text mode shows it: 7-bit in the card's 8-bit set, anything else hexadecimal.
std::string BodyText(const Tpdu& pdu) {
    if (Alphabet(pdu.coding) != 0) return pdu.userData;
    char codes[200], shown[200];
    const int count = UnpackSeptets(pdu.userData.data(), static_cast<int>(pdu.userData.size()),
                                    codes, sizeof codes, pdu.userDataLength);
    const int length = GsmToDisplay(codes, count, shown, sizeof shown);
    return std::string(shown, static_cast<size_t>(length));
}

// A body typed at the card's prompt in text mode, in its 8-bit set, as packed user data.
std::string PackText(const std::string& text, int* septets) {
    std::vector<uint8_t> codes;
    for (char c : text) {
        const int code = LatinToGsmCode(static_cast<uint8_t>(c));
        codes.push_back(static_cast<uint8_t>(code < 0 ? '?' : code));
    }
    if (codes.size() > 160) codes.resize(160);
    *septets = static_cast<int>(codes.size());
    char hex[400];
    if (codes.empty()) return {};
    PackGsmCodes(codes.data(), static_cast<int>(codes.size()), hex, sizeof hex);
    return hex;
}

// A message from the network in the form its sender typed it (UTF-8): 7-bit when every
// character is in the default alphabet, UCS2 otherwise. "" when it does not fit one message.
std::string DeliverUserData(const std::string& utf8, int* coding, int* length) {
    const std::u16string text = Utf8ToUtf16(utf8);
    std::vector<uint8_t> codes;
    bool septets = true;
    for (char16_t c : text) {
        const int code = WideToGsmCode(c);
        if (code < 0 || code == 0x1B) {
            septets = false;
            break;
        }
        codes.push_back(static_cast<uint8_t>(code));
    }
    char hex[400] = "";
    if (septets) {
        if (codes.size() > 160) return "!";
        *coding = 0;
        *length = static_cast<int>(codes.size());
        if (!codes.empty())
            PackGsmCodes(codes.data(), static_cast<int>(codes.size()), hex, sizeof hex);
        return hex;
    }
    if (text.size() > 70) return "!";
    *coding = 8;
    *length = static_cast<int>(text.size() * 2);
    TextToUcs2Hex(text.data(), text.size() * 2, hex, sizeof hex);
    return hex;
}

// A sender's name (a bank, an operator) in place of a number: letters and digits, at most 11.
bool IsAlphanumericSender(const std::string& name) {
    if (name.empty() || name.size() > 11) return false;
    bool letter = false;
    for (char c : name) {
        if (!std::isalnum(static_cast<unsigned char>(c))) return false;
        letter = letter || std::isalpha(static_cast<unsigned char>(c));
    }
    return letter;
}

// The name as an address: its 7-bit characters packed, the length in semi-octets, type 0xD0.
std::string EncodeAlphanumericAddress(const std::string& name) {
    std::vector<uint8_t> codes;
    for (char c : name)
        codes.push_back(static_cast<uint8_t>(LatinToGsmCode(static_cast<uint8_t>(c))));
    char hex[64];
    PackGsmCodes(codes.data(), static_cast<int>(codes.size()), hex, sizeof hex);
    const int semiOctets = (static_cast<int>(codes.size()) * 7 + 3) / 4;
    return HexOctet(semiOctets) + "D0" + hex;
}

// A text too long for one message as the network sends it: parts of 153 septets (or 67 UCS2
// characters), each behind a concatenation header naming the reference, the count and its
// place. Each entry is {coding, user-data length, user data}.
struct DeliveryPart {
    int coding;
    int length;
    std::string userData;
};
std::vector<DeliveryPart> SplitForDelivery(const std::string& utf8, int reference) {
    const std::u16string text = Utf8ToUtf16(utf8);
    std::vector<uint8_t> codes;
    bool septets = true;
    for (char16_t c : text) {
        const int code = WideToGsmCode(c);
        if (code < 0 || code == 0x1B) {
            septets = false;
            break;
        }
        codes.push_back(static_cast<uint8_t>(code));
    }
    const size_t per = septets ? 153 : 67;
    const size_t units = septets ? codes.size() : text.size();
    const int total = static_cast<int>((units + per - 1) / per);
    std::vector<DeliveryPart> parts;
    for (int n = 0; n < total; ++n) {
        const std::string header =
            "050003" + HexOctet(reference) + HexOctet(total) + HexOctet(n + 1);
        const size_t from = n * per, count = std::min(per, units - from);
        if (septets) {
            // Seven septets of room for the six header octets and the fill bit before the text.
            std::vector<uint8_t> padded(7, 0);
            padded.insert(padded.end(), codes.begin() + from, codes.begin() + from + count);
            char hex[400];
            PackGsmCodes(padded.data(), static_cast<int>(padded.size()), hex, sizeof hex);
            parts.push_back({0, static_cast<int>(padded.size()), header + (hex + 12)});
        } else {
            char hex[400];
            TextToUcs2Hex(text.data() + from, count * 2, hex, sizeof hex);
            parts.push_back({8, static_cast<int>(6 + count * 2), header + hex});
        }
    }
    return parts;
}

std::string NowStamp() {
    const std::time_t now = std::time(nullptr);
    std::tm local{};
    localtime_r(&now, &local);
    return StampHex(local, local.tm_gmtoff);
}

}  // namespace

void MessageMemory::Change() {
    if (engine_) engine_->MarkChanged();
}

int MessageMemory::FreeIndex() const {
    for (int index = 1; index <= capacity_; ++index)
        if (!messages_.count(index)) return index;
    return 0;
}

Handled MessageMemory::Run(const std::string& upper, const std::string& original, std::string& info,
                           std::string& errorText) {
    struct Name {
        const char* text;
        int id;
    };
    static const Name kNames[] = {{"+CMGF", 0}, {"+CPMS", 1}, {"+CMGR", 2}, {"+CMGW", 3},
                                  {"+CMGS", 4}, {"+CMSS", 5}, {"+CMGD", 6}, {"+CMGL", 7},
                                  {"+CSCA", 8}, {"+CSMP", 9}};
    for (const Name& name : kNames) {
        const std::string tag = name.text;
        if (!StartsWith(upper, tag)) continue;
        const std::string tail = original.substr(tag.size());
        const bool test = tail == "=?";
        const bool query = tail == "?";
        const bool set = !tail.empty() && tail[0] == '=' && !test;
        const std::string args = set ? tail.substr(1) : std::string();
        if (!test && !query && !set && !tail.empty()) return Handled::No;  // e.g. +CMGLX
        switch (name.id) {
            case 0:
                if (test) return info += "\r\n+CMGF: (0,1)\r\n", Handled::Ok;
                return Format(args, query, info);
            case 1:
                return Memories(args, query, test, info, errorText);
            case 2:
                if (test) return Handled::Ok;
                if (!set) return Handled::Error;
                return ReadOne(args, info, errorText);
            case 3:
            case 4:
                if (test) return Handled::Ok;
                if (query) return Handled::Error;
                return StartWrite(args, name.id == 4, errorText);
            case 5:
                if (test) return Handled::Ok;
                if (!set) return Handled::Error;
                return SendStored(args, info, errorText);
            case 6:
                if (test)
                    return info += "\r\n+CMGD: (1-" + std::to_string(capacity_) + "),(0-4)\r\n",
                           Handled::Ok;
                if (!set) return Handled::Error;
                return Delete(args, errorText);
            case 7:
                if (query) return Handled::Error;
                return List(args, test, info, errorText);
            case 8:
                if (test) return Handled::Ok;
                return CentreCommand(args, query, info);
            case 9:
                if (test) return Handled::Ok;
                return Parameters(args, query, info);
        }
    }
    return Handled::No;
}

Handled MessageMemory::Format(const std::string& args, bool query, std::string& info) {
    if (query) {
        info += "\r\n+CMGF: " + std::to_string(mode_) + "\r\n";
        return Handled::Ok;
    }
    const std::vector<Field> fields = Fields(args);
    int mode = 0;
    if (fields.size() > 1 || (!fields.empty() && !Number(fields[0], 0, 1, &mode)))
        return Handled::Error;
    mode_ = mode;
    return Handled::Ok;
}

Handled MessageMemory::Memories(const std::string& args, bool query, bool test, std::string& info,
                                std::string& errorText) {
    const std::string counts = std::to_string(messages_.size()) + "," + std::to_string(capacity_);
    if (test) {
        info += "\r\n+CPMS: (\"SM\"),(\"SM\"),(\"SM\")\r\n";
        return Handled::Ok;
    }
    if (query) {
        info += "\r\n+CPMS: \"SM\"," + counts + ",\"SM\"," + counts + ",\"SM\"," + counts + "\r\n";
        return Handled::Ok;
    }
    const std::vector<Field> fields = Fields(args);
    if (fields.empty() || fields.size() > 3) return Handled::Error;
    for (const Field& field : fields) {
        std::string memory = field.text;
        for (char& c : memory)
            c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        if (!field.quoted || memory != "SM") {
            errorText = kNotAllowed;  // the SIM is the only message memory here
            return Handled::Error;
        }
    }
    info += "\r\n+CPMS: " + counts;
    for (size_t i = 1; i < fields.size(); ++i)
        info += "," + counts;
    info += "\r\n";
    return Handled::Ok;
}

std::string MessageMemory::Listing(const std::string& tag, int index, const Stored& message,
                                   bool withIndex) {
    const std::string head = tag + ": " + (withIndex ? std::to_string(index) + "," : "");
    Tpdu pdu;
    const bool decoded = Decode(message.pdu, &pdu);
    if (mode_ == 0) {
        const int octets = decoded ? pdu.octets : static_cast<int>(message.pdu.size() / 2);
        return "\r\n" + head + std::to_string(message.stat) + ",," + std::to_string(octets) +
               "\r\n" + message.pdu + "\r\n";
    }
    std::string line = head + "\"" + kStatWords[message.stat] + "\",\"" + pdu.number + "\",";
    if (pdu.type == 0) line += ",\"" + pdu.stamp + "\"";
    return "\r\n" + line + "\r\n" + (decoded ? BodyText(pdu) : std::string()) + "\r\n";
}

Handled MessageMemory::ReadOne(const std::string& args, std::string& info, std::string& errorText) {
    const std::vector<Field> fields = Fields(args);
    int index = 0;
    if (fields.size() != 1 || !Number(fields[0], 0, 65535, &index)) return Handled::Error;
    auto found = messages_.find(index);
    if (found == messages_.end()) {
        errorText = kInvalidIndex;
        return Handled::Error;
    }
    info += Listing("+CMGR", index, found->second, false);
    if (found->second.stat == RecUnread) {  // reading it marks it read, as on a real SIM
        found->second.stat = RecRead;
        Change();
    }
    return Handled::Ok;
}

Handled MessageMemory::List(const std::string& args, bool test, std::string& info,
                            std::string& errorText) {
    if (test) {
        info += mode_ == 0 ? "\r\n+CMGL: (0-4)\r\n"
                           : "\r\n+CMGL: (\"REC UNREAD\",\"REC READ\",\"STO UNSENT\",\"STO "
                             "SENT\",\"ALL\")\r\n";
        return Handled::Ok;
    }
    const std::vector<Field> fields = Fields(args);
    if (fields.size() > 1) return Handled::Error;
    int wanted = 0;  // 0..3 one status, 4 all
    if (!fields.empty()) {
        bool ok = false;
        if (mode_ == 0) {
            ok = Number(fields[0], 0, 4, &wanted);
        } else if (fields[0].quoted) {
            for (int i = 0; i < 4; ++i)
                if (fields[0].text == kStatWords[i]) ok = true, wanted = i;
            if (fields[0].text == "ALL") ok = true, wanted = 4;
        }
        if (!ok) {
            errorText = mode_ == 0 ? kBadPduParameter : kBadTextParameter;
            return Handled::Error;
        }
    }
    bool changed = false;
    for (auto& [index, message] : messages_) {
        if (wanted != 4 && message.stat != wanted) continue;
        info += Listing("+CMGL", index, message, true);
        if (message.stat == RecUnread) {
            message.stat = RecRead;
            changed = true;
        }
    }
    if (changed) Change();
    return Handled::Ok;
}

Handled MessageMemory::Delete(const std::string& args, std::string& errorText) {
    const std::vector<Field> fields = Fields(args);
    int index = 0, flag = 0;
    if (fields.empty() || fields.size() > 2 || !Number(fields[0], 0, 65535, &index) ||
        (fields.size() == 2 && !Number(fields[1], 0, 4, &flag)))
        return Handled::Error;
    if (flag == 0) {
        if (index < 1 || index > capacity_) {
            errorText = kInvalidIndex;
            return Handled::Error;
        }
        if (messages_.erase(index)) Change();
        return Handled::Ok;
    }
    // 1 read, 2 read and sent, 3 read, sent and unsent, 4 all (27.005 <delflag>).
    for (auto it = messages_.begin(); it != messages_.end();) {
        const int stat = it->second.stat;
        const bool goes = flag == 4 || stat == RecRead || (flag >= 2 && stat == StoSent) ||
                          (flag >= 3 && stat == StoUnsent);
        it = goes ? messages_.erase(it) : std::next(it);
    }
    Change();
    return Handled::Ok;
}

Handled MessageMemory::SendStored(const std::string& args, std::string& info,
                                  std::string& errorText) {
    const std::vector<Field> fields = Fields(args);
    int index = 0;
    if (fields.empty() || fields.size() > 3 || !Number(fields[0], 0, 65535, &index))
        return Handled::Error;
    auto found = messages_.find(index);
    if (found == messages_.end()) {
        errorText = kInvalidIndex;
        return Handled::Error;
    }
    Tpdu pdu;
    if (found->second.stat < StoUnsent || !Decode(found->second.pdu, &pdu) || pdu.type != 1) {
        errorText = kNotAllowed;  // only a message stored for sending can be sent
        return Handled::Error;
    }
    if (!pdu.centreGiven && centre_.empty()) {
        errorText = kCentreUnknown;
        return Handled::Error;
    }
    found->second.stat = StoSent;
    Change();
    info += "\r\n+CMSS: " + std::to_string(nextReference_) + "\r\n";
    nextReference_ = (nextReference_ + 1) % 256;
    return Handled::Ok;
}

Handled MessageMemory::StartWrite(const std::string& args, bool send, std::string& errorText) {
    const std::vector<Field> fields = Fields(args);
    if (!send && FreeIndex() == 0) {
        errorText = kMemoryFull;
        return Handled::Error;
    }
    pendingStat_ = StoUnsent;
    if (mode_ == 0) {
        // <length>[,<stat>]
        int length = 0;
        if (fields.empty() || fields.size() > (send ? 1u : 2u) ||
            !Number(fields[0], 1, 255, &length) ||
            (fields.size() == 2 && !Number(fields[1], 0, 3, &pendingStat_))) {
            errorText = kBadPduParameter;
            return Handled::Error;
        }
        pendingLength_ = length;
        pending_ = send ? Pending::SendPdu : Pending::WritePdu;
        return Handled::Prompt;
    }
    // ["<da>"[,<toda>[,<stat>]]]
    pendingNumber_.clear();
    if (!fields.empty()) {
        int type = 129;
        bool ok = fields[0].quoted && (fields[0].text.empty() || IsDialNumber(fields[0].text));
        if (ok && fields.size() >= 2) ok = Number(fields[1], 0, 255, &type);
        if (ok && fields.size() == 3 && !send) {
            ok = false;
            for (int i = 0; i < 4; ++i)
                if (fields[2].quoted && fields[2].text == kStatWords[i])
                    ok = true, pendingStat_ = i;
        }
        if (!ok || fields.size() > (send ? 2u : 3u)) {
            errorText = kBadTextParameter;
            return Handled::Error;
        }
        pendingNumber_ = fields[0].text;
        if (type == 145 && !pendingNumber_.empty() && pendingNumber_[0] != '+')
            pendingNumber_.insert(0, "+");
    }
    if (send && pendingNumber_.empty()) {
        errorText = kBadTextParameter;
        return Handled::Error;
    }
    pending_ = send ? Pending::SendText : Pending::WriteText;
    return Handled::Prompt;
}

std::string MessageMemory::SubmitFromText(const std::string& number,
                                          const std::string& text) const {
    int septets = 0;
    const std::string userData = PackText(text, &septets);
    // The text-mode submit parameters (AT+CSMP) shape the PDU; only a relative validity
    // period is carried, other formats go without one.
    const bool relative = ((firstOctet_ >> 3) & 3) == 2;
    const int firstOctet = (firstOctet_ & ~0x1B) | 0x01 | (relative ? 0x10 : 0);
    return "00" + HexOctet(firstOctet) + "00" + EncodeAddress(number, false) + HexOctet(protocol_) +
           "00" + (relative ? HexOctet(validity_) : "") + HexOctet(septets) + userData;
}

bool MessageMemory::Complete(const std::string& text, std::string& info, std::string& errorText) {
    const Pending pending = pending_;
    pending_ = Pending::None;
    std::string pduText;
    int stat = pendingStat_;
    if (pending == Pending::WritePdu || pending == Pending::SendPdu) {
        pduText = text;
        for (char& c : pduText)
            c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        Tpdu pdu;
        // The length given with the command counts the TPDU without the centre address; a
        // PDU that disagrees with it, or is not the kind the command stores, is refused.
        if (!Decode(pduText, &pdu) || pdu.octets != pendingLength_ ||
            (pending == Pending::SendPdu && pdu.type != 1) ||
            (pending == Pending::WritePdu && pdu.type != (stat <= RecRead ? 0 : 1))) {
            errorText = kBadPduParameter;
            return false;
        }
        if (pending == Pending::SendPdu && !pdu.centreGiven && centre_.empty()) {
            errorText = kCentreUnknown;
            return false;
        }
    } else if (pending == Pending::WriteText || pending == Pending::SendText) {
        if (stat <= RecRead) stat = StoUnsent;  // text mode writes submits only
        pduText = SubmitFromText(pendingNumber_, text);
        if (pending == Pending::SendText && centre_.empty()) {
            errorText = kCentreUnknown;
            return false;
        }
    } else {
        return false;
    }
    if (pending == Pending::SendPdu || pending == Pending::SendText) {
        info += "\r\n+CMGS: " + std::to_string(nextReference_) + "\r\n";
        nextReference_ = (nextReference_ + 1) % 256;
        return true;
    }
    const int index = FreeIndex();
    if (index == 0) {
        errorText = kMemoryFull;
        return false;
    }
    messages_[index] = Stored{stat, pduText};
    Change();
    info += "\r\n+CMGW: " + std::to_string(index) + "\r\n";
    return true;
}

Handled MessageMemory::CentreCommand(const std::string& args, bool query, std::string& info) {
    if (query) {
        info += "\r\n+CSCA: \"" + centre_ + "\"," + std::to_string(centreType_) + "\r\n";
        return Handled::Ok;
    }
    const std::vector<Field> fields = Fields(args);
    int type = 0;
    if (fields.empty() || fields.size() > 2 || !fields[0].quoted ||
        (!fields[0].text.empty() && !IsDialNumber(fields[0].text)) ||
        (fields.size() == 2 && !Number(fields[1], 0, 255, &type)))
        return Handled::Error;
    // An empty number goes back to the centre the SIM itself holds, as "Use SIM Default" expects.
    centre_ = fields[0].text.empty() ? kSimCentre : fields[0].text;
    if (type == 145 && !centre_.empty() && centre_[0] != '+') centre_.insert(0, "+");
    centreType_ = !centre_.empty() && centre_[0] == '+' ? 145 : 129;
    Change();
    return Handled::Ok;
}

Handled MessageMemory::Parameters(const std::string& args, bool query, std::string& info) {
    if (query) {
        info += "\r\n+CSMP: " + std::to_string(firstOctet_) + "," + std::to_string(validity_) +
                "," + std::to_string(protocol_) + "," + std::to_string(coding_) + "\r\n";
        return Handled::Ok;
    }
    const std::vector<Field> fields = Fields(args);
    if (fields.size() > 4) return Handled::Error;
    int values[4] = {firstOctet_, validity_, protocol_, coding_};
    // Fields left out keep their value, as 27.005 has it.
    for (size_t i = 0; i < fields.size(); ++i)
        if (fields[i].present && !Number(fields[i], 0, 255, &values[i])) return Handled::Error;
    firstOctet_ = values[0], validity_ = values[1], protocol_ = values[2], coding_ = values[3];
    Change();
    return Handled::Ok;
}

std::string MessageMemory::Deliver(const std::string& pdu) {
    const int index = FreeIndex();
    if (index == 0) return "ERROR: SIM message memory full";
    messages_[index] = Stored{RecUnread, pdu};
    Change();
    if (engine_) engine_->Unsolicited("+CMTI: \"SM\"," + std::to_string(index));
    return {};
}

std::string MessageMemory::Control(const std::string& command, const std::string& rest) {
    if (command == "deliver") {
        std::istringstream words(rest);
        std::string number;
        words >> number;
        const bool named = !IsDialNumber(number) && IsAlphanumericSender(number);
        if (!IsDialNumber(number) && !named)
            return "ERROR: deliver needs a number (or a sender's name) and a text";
        const size_t textAt = rest.find_first_not_of(" \t", rest.find(number) + number.size());
        const std::string text = textAt == std::string::npos ? "" : rest.substr(textAt);
        const std::string centre = centre_.empty() ? "00" : EncodeAddress(centre_, true);
        const std::string sender =
            named ? EncodeAlphanumericAddress(number) : EncodeAddress(number, false);
        int coding = 0, length = 0;
        const std::string userData = DeliverUserData(text, &coding, &length);
        if (userData != "!") {
            const std::string why = Deliver(centre + "04" + sender + "00" + HexOctet(coding) +
                                            NowStamp() + HexOctet(length) + userData);
            return why.empty() ? "OK" : why;
        }
        // Too long for one message: the parts arrive one by one, as from a network.
        const std::vector<DeliveryPart> parts = SplitForDelivery(text, ++nextConcatReference_ & 0xFF);
        if (parts.size() > 255) return "ERROR: text too long";
        for (const DeliveryPart& part : parts) {
            const std::string why = Deliver(centre + "44" + sender + "00" + HexOctet(part.coding) +
                                            NowStamp() + HexOctet(part.length) + part.userData);
            if (!why.empty()) return why;
        }
        return "OK";
    }
    if (command == "deliver-pdu") {
        std::string hex;
        std::istringstream(rest) >> hex;
        for (char& c : hex)
            c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        Tpdu pdu;
        if (!Decode(hex, &pdu) || pdu.type != 0)
            return "ERROR: deliver-pdu needs an SMS-DELIVER PDU in hexadecimal";
        const std::string why = Deliver(hex);
        return why.empty() ? "OK" : why;
    }
    if (command == "capacity") {
        Field field;
        std::istringstream(rest) >> field.text;
        int capacity = 0;
        if (!Number(field, 1, kMaxCapacity, &capacity))
            return "ERROR: capacity needs a number from 1 to 255";
        if (!messages_.empty() && messages_.rbegin()->first > capacity)
            return "ERROR: messages are stored above location " + std::to_string(capacity);
        capacity_ = capacity;
        Change();
        return "OK";
    }
    return {};
}

std::string MessageMemory::ControlHelp() const {
    return "  deliver NUMBER TEXT      a short message from NUMBER (or a name such as MyBank)\n"
           "                           arrives on the SIM; a long text arrives in parts\n"
           "  deliver-pdu HEX          an SMS-DELIVER PDU (centre address first) arrives\n"
           "  capacity N               the SIM holds N messages (1..255)\n";
}

void MessageMemory::Save(std::ostream& out) const {
    out << "sms-capacity " << capacity_ << "\n";
    if (!centre_.empty()) out << "sms-centre " << centre_ << "\n";
    out << "sms-params " << firstOctet_ << " " << validity_ << " " << protocol_ << " " << coding_
        << "\n";
    for (const auto& [index, message] : messages_)
        out << "sms " << index << " " << message.stat << " " << message.pdu << "\n";
}

bool MessageMemory::Load(const std::string& name, const std::string& rest) {
    std::istringstream words(rest);
    if (name == "sms-capacity") {
        int capacity = 0;
        if (words >> capacity && capacity >= 1 && capacity <= kMaxCapacity) capacity_ = capacity;
    } else if (name == "sms-centre") {
        std::string centre;
        if (words >> centre && IsDialNumber(centre)) {
            centre_ = centre;
            centreType_ = centre[0] == '+' ? 145 : 129;
        }
    } else if (name == "sms-params") {
        int v[4];
        if (words >> v[0] >> v[1] >> v[2] >> v[3])
            firstOctet_ = v[0] & 0xFF, validity_ = v[1] & 0xFF, protocol_ = v[2] & 0xFF,
            coding_ = v[3] & 0xFF;
    } else if (name == "sms") {
        int index = 0, stat = 0;
        std::string hex;
        Tpdu pdu;
        // A damaged line costs only its own message.
        if (words >> index >> stat >> hex && index >= 1 && index <= kMaxCapacity && stat >= 0 &&
            stat <= 3 && Decode(hex, &pdu)) {
            messages_[index] = Stored{stat, hex};
            if (index > capacity_) capacity_ = index;
        }
    } else {
        return false;
    }
    return true;
}

void MessageMemory::FillDemo() {
    centre_ = kSimCentre;
    centreType_ = 145;
    const std::string centre = EncodeAddress(centre_, true);
    struct Demo {
        int stat;
        const char* number;
        const char* stamp;  // semi-octets as they travel
        const char* text;   // UTF-8
    };
    static const Demo kDemo[] = {
        {RecRead, "+306944123456", "20301141526300",
         "Welcome to your new SIM. Reply HELP for help."},
        {RecUnread, "+447700900123", "20301190000000",
         "Meeting moved to 15:30, see you @ the office"},
        {RecRead, "6977654321", "20301281201580", "Καλημέρα! Τα λέμε αύριο;"},
        {StoUnsent, "2101234567", nullptr, "Call the bank tomorrow"},
    };
    int index = 1;
    for (const Demo& demo : kDemo) {
        int coding = 0, length = 0;
        const std::string userData = DeliverUserData(demo.text, &coding, &length);
        std::string pdu;
        if (demo.stamp)
            pdu = centre + "04" + EncodeAddress(demo.number, false) + "00" + HexOctet(coding) +
                  demo.stamp + HexOctet(length) + userData;
        else
            pdu = "001100" + EncodeAddress(demo.number, false) + "00" + HexOctet(coding) + "A7" +
                  HexOctet(length) + userData;
        messages_[index++] = Stored{demo.stat, pdu};
    }
    Change();
}

}  // namespace vqm::cardsim
