#include "cardsim/network_services.h"

#include <cctype>
#include <cstdlib>
#include <ostream>
#include <sstream>

#include "cardsim/arguments.h"
#include "cardsim/card_engine.h"

namespace vqm::cardsim {

namespace {

constexpr const char* kBarringNames[NetworkServices::kBarrings] = {"AO", "OI", "OX", "AI", "IR"};
constexpr const char* kLockNames[NetworkServices::kLocks] = {"SC", "P2", "PS"};
constexpr int kClassBits[NetworkServices::kClasses] = {1, 2, 4};

// +CME ERROR codes of 27.007 the services answer with.
constexpr int kNotAllowed = 3;
constexpr int kNotSupported = 4;
constexpr int kWrongPassword = 16;
constexpr int kPukRequired = 12;
constexpr int kPuk2Required = 18;
constexpr int kNoNetwork = 30;

using Field = Argument;

std::string Upper(std::string text) {
    for (char& c : text)
        c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    return text;
}

bool StartsWith(const std::string& text, const char* prefix) {
    return text.rfind(prefix, 0) == 0;
}

// The engine refuses a command whose parameters do not split, so a failed split (no fields)
// never gets here; it would read as missing parameters anyway.
std::vector<Field> SplitFields(const std::string& args) {
    std::vector<Field> fields;
    SplitArguments(args, &fields);
    return fields;
}

// A whole decimal number of at most nine digits.
bool ToInt(const std::string& text, int* value) {
    if (text.empty() || text.size() > 9) return false;
    for (char c : text)
        if (c < '0' || c > '9') return false;
    *value = std::atoi(text.c_str());
    return true;
}

bool FieldInt(const std::vector<Field>& fields, size_t index, int low, int high, int* value) {
    return index < fields.size() && ToInt(fields[index].text, value) && *value >= low &&
           *value <= high;
}

bool IsDialable(const std::string& number) {
    return !number.empty() && number.size() <= 40 &&
           number.find_first_not_of("+0123456789*#") == std::string::npos &&
           number.find('+', 1) == std::string::npos;
}

bool AllDigits(const std::string& code, size_t low, size_t high) {
    int ignored = 0;
    return code.size() >= low && code.size() <= high && ToInt(code, &ignored);
}

int BarringIndex(const std::string& facility) {
    for (int i = 0; i < NetworkServices::kBarrings; ++i)
        if (facility == kBarringNames[i]) return i;
    return -1;
}

// The barring facilities a facility name covers, one bit per index of kBarringNames.
int BarringGroup(const std::string& facility) {
    if (facility == "AB") return 0x1F;
    if (facility == "AG") return 0x07;
    if (facility == "AC") return 0x18;
    const int index = BarringIndex(facility);
    return index < 0 ? 0 : 1 << index;
}

int LockIndex(const std::string& facility) {
    for (int i = 0; i < NetworkServices::kLocks; ++i)
        if (facility == kLockNames[i]) return i;
    return -1;
}

Handled Cme(std::string& errorText, int code) {
    errorText = "+CME ERROR: " + std::to_string(code);
    return Handled::Error;
}

void Line(std::string& info, const std::string& text) {
    info += "\r\n" + text + "\r\n";
}

// "CODE:STAT[,CODE:STAT...]"; codes have five digits, as the dialler's search reads them.
bool ParseNetworks(const std::string& text, std::vector<NetworkServices::Network>* out) {
    out->clear();
    if (text == "none") return true;
    if (text.empty() || text.back() == ',') return false;
    std::istringstream items(text);
    std::string item;
    while (std::getline(items, item, ',')) {
        const size_t colon = item.find(':');
        int code = 0, status = 0;
        if (colon == std::string::npos || !ToInt(item.substr(0, colon), &code) ||
            !ToInt(item.substr(colon + 1), &status) || code < 10000 || code > 99999 || status < 0 ||
            status > 3)
            return false;
        out->push_back({code, status});
    }
    return !out->empty();
}

}  // namespace

void NetworkServices::FillDemo() {
    networks_ = {{20201, 2}, {20205, 1}, {20210, 1}, {20801, 3}};
    forwards_ = {};
    barred_ = {};
    locked_ = {false, true, false};  // PIN2 is always asked for; PIN and phone lock are off
    codes_ = {"1234", "5678", "12345"};
    barringPassword_ = "0000";
    tries_ = {kPinTries, kPinTries};
    bearer_ = {7, 0, 1};
    hscsd_ = {0, 0, 0, 0};
}

Handled NetworkServices::CheckPin(int lock, const std::string& given, std::string& errorText) {
    if (lock > 1) {
        // The phone code has no tries to lose.
        return given == codes_[lock] ? Handled::Ok : Cme(errorText, kWrongPassword);
    }
    if (tries_[lock] == 0) return Cme(errorText, lock == 0 ? kPukRequired : kPuk2Required);
    if (given == codes_[lock]) {
        if (tries_[lock] != kPinTries && engine_) engine_->MarkChanged();
        tries_[lock] = kPinTries;
        return Handled::Ok;
    }
    --tries_[lock];
    if (engine_) engine_->MarkChanged();
    // The third wrong PIN already answers as the blocked SIM does.
    if (tries_[lock] == 0) return Cme(errorText, lock == 0 ? kPukRequired : kPuk2Required);
    return Cme(errorText, kWrongPassword);
}

int NetworkServices::CurrentCode() const {
    return engine_ ? engine_->Config().operatorCode : 0;
}

Handled NetworkServices::Run(const std::string& upper, const std::string& original,
                             std::string& info, std::string& errorText) {
    auto changed = [&] {
        if (engine_) engine_->MarkChanged();
    };
    if (upper == "+COPS=?") return RunCops({}, true, info, errorText);
    if (StartsWith(upper, "+COPS=")) return RunCops(original.substr(6), false, info, errorText);

    if (upper == "+CCFC=?") return Line(info, "+CCFC: (0-5)"), Handled::Ok;
    if (StartsWith(upper, "+CCFC=")) return RunCcfc(original.substr(6), info, errorText);

    if (upper == "+CLCK=?") {
        Line(info,
             "+CLCK: "
             "(\"AO\",\"OI\",\"OX\",\"AI\",\"IR\",\"AB\",\"AG\",\"AC\",\"SC\",\"P2\",\"PS\")");
        return Handled::Ok;
    }
    if (StartsWith(upper, "+CLCK=")) return RunClck(original.substr(6), info, errorText);

    if (upper == "+CPWD=?") {
        Line(info, "+CPWD: (\"SC\",8),(\"P2\",8),(\"PS\",8),(\"AB\",4)");
        return Handled::Ok;
    }
    if (StartsWith(upper, "+CPWD=")) return RunCpwd(original.substr(6), errorText);

    if (upper == "+CBST?") {
        Line(info, "+CBST: " + std::to_string(bearer_[0]) + "," + std::to_string(bearer_[1]) + "," +
                       std::to_string(bearer_[2]));
        return Handled::Ok;
    }
    if (upper == "+CBST=?") return Line(info, "+CBST: (0-134),(0-7),(0-3)"), Handled::Ok;
    if (StartsWith(upper, "+CBST=")) {
        // Omitted trailing values keep what was set before.
        const auto fields = SplitFields(upper.substr(6));
        static constexpr int kHigh[3] = {134, 7, 3};
        std::array<int, 3> next = bearer_;
        if (fields.size() > next.size()) return Handled::Error;
        for (size_t i = 0; i < fields.size(); ++i) {
            if (fields[i].Empty() && i > 0) continue;
            if (!FieldInt(fields, i, 0, kHigh[i], &next[i])) return Handled::Error;
        }
        bearer_ = next;
        changed();
        return Handled::Ok;
    }

    if (upper == "+CHSN?") {
        Line(info, "+CHSN: " + std::to_string(hscsd_[0]) + "," + std::to_string(hscsd_[1]) + "," +
                       std::to_string(hscsd_[2]) + "," + std::to_string(hscsd_[3]));
        return Handled::Ok;
    }
    if (upper == "+CHSN=?") return Line(info, "+CHSN: (0-7),(0-8),(0-8),(0-255)"), Handled::Ok;
    if (StartsWith(upper, "+CHSN=")) {
        const auto fields = SplitFields(upper.substr(6));
        static constexpr int kHigh[4] = {7, 8, 8, 255};
        std::array<int, 4> next = hscsd_;
        if (fields.size() > next.size()) return Handled::Error;
        for (size_t i = 0; i < fields.size(); ++i) {
            if (fields[i].Empty() && i > 0) continue;
            if (!FieldInt(fields, i, 0, kHigh[i], &next[i])) return Handled::Error;
        }
        hscsd_ = next;
        changed();
        return Handled::Ok;
    }
    return Handled::No;
}

Handled NetworkServices::RunCops(const std::string& args, bool list, std::string& info,
                                 std::string& errorText) {
    if (list) {
        // One "<stat>,,,<code>," per network and nothing else: the dialler reads this list
        // with a fixed stride of ten characters.
        std::string text = "+COPS: ";
        for (const Network& network : networks_) {
            int status = network.status;
            if (status != 3)
                status = network.code == CurrentCode() ? 2 : (status == 2 ? 1 : status);
            text += std::to_string(status) + ",,," + std::to_string(network.code) + ",";
        }
        Line(info, text);
        return Handled::Ok;
    }
    const auto fields = SplitFields(args);
    int mode = 0, format = 0, code = 0;
    if (!FieldInt(fields, 0, 0, 4, &mode)) return Handled::Error;
    if (mode == 0) {
        if (fields.size() > 2) return Handled::Error;
        engine_->ChangeConfig().selectionMode = 0;
        // Automatic selection stays on the current network while it may be used.
        bool currentUsable = networks_.empty();
        for (const Network& network : networks_)
            if (network.code == CurrentCode() && network.status != 3) currentUsable = true;
        if (!currentUsable) {
            const Network* pick = nullptr;
            for (const Network& network : networks_)
                if (!pick && network.status != 3) pick = &network;
            if (!pick) return Cme(errorText, kNoNetwork);
            if (engine_) engine_->ChangeConfig().operatorCode = pick->code;
        }
        if (engine_) engine_->MarkChanged();
        return Handled::Ok;
    }
    if (mode == 3) {
        // Only the numeric format is spoken: "+COPS?" always reports codes.
        if (fields.size() != 2 || !FieldInt(fields, 1, 2, 2, &format))
            return Cme(errorText, kNotSupported);
        return Handled::Ok;
    }
    if (mode != 1) return Cme(errorText, kNotSupported);
    if (fields.size() != 3 || !FieldInt(fields, 1, 0, 2, &format)) return Handled::Error;
    if (format != 2) return Cme(errorText, kNotSupported);
    if (!FieldInt(fields, 2, 0, 999999, &code)) return Handled::Error;
    const Network* found = nullptr;
    for (const Network& network : networks_)
        if (network.code == code) found = &network;
    if (!found) return Cme(errorText, kNoNetwork);
    if (found->status == 3) return Cme(errorText, kNotAllowed);
    engine_->ChangeConfig().selectionMode = 1;
    if (engine_) engine_->ChangeConfig().operatorCode = code;
    return Handled::Ok;
}

Handled NetworkServices::RunCcfc(const std::string& args, std::string& info,
                                 std::string& errorText) {
    const auto fields = SplitFields(args);
    int reason = 0, mode = 0, serviceClass = 7;
    if (!FieldInt(fields, 0, 0, 5, &reason) || !FieldInt(fields, 1, 0, 4, &mode))
        return Handled::Error;
    if (fields.size() > 4 && !fields[4].Empty() && !FieldInt(fields, 4, 1, 255, &serviceClass))
        return Handled::Error;
    if ((serviceClass & 7) == 0) return Cme(errorText, kNotAllowed);
    // Reason 4 is every forward, 5 every conditional one.
    const int firstReason = reason == 4 ? 0 : (reason == 5 ? 1 : reason);
    const int lastReason = reason >= 4 ? kReasons - 1 : reason;
    auto each = [&](auto&& action) {
        for (int r = firstReason; r <= lastReason; ++r)
            for (int c = 0; c < kClasses; ++c)
                if (serviceClass & kClassBits[c]) action(forwards_[r][c]);
    };

    if (mode == 2) {
        if (reason >= 4) return Cme(errorText, kNotAllowed);
        bool any = false;
        for (int c = 0; c < kClasses; ++c) {
            const Forward& forward = forwards_[reason][c];
            if (!(serviceClass & kClassBits[c]) || !forward.active) continue;
            std::string text = "+CCFC: 1," + std::to_string(kClassBits[c]) + ",\"" +
                               forward.number + "\"," + std::to_string(forward.type);
            if (reason == 2) text += ",,," + std::to_string(forward.seconds);
            Line(info, text);
            any = true;
        }
        if (!any) Line(info, "+CCFC: 0," + std::to_string(serviceClass & 7));
        return Handled::Ok;
    }
    if (mode == 3) {
        const std::string number = fields.size() > 2 ? fields[2].text : "";
        if (!IsDialable(number)) return Cme(errorText, kNotAllowed);
        int type = number[0] == '+' ? 145 : 129, seconds = 20;
        if (fields.size() > 3 && !fields[3].Empty() && !FieldInt(fields, 3, 128, 255, &type))
            return Handled::Error;
        if (fields.size() > 7 && !fields[7].Empty() && !FieldInt(fields, 7, 1, 30, &seconds))
            return Handled::Error;
        each([&](Forward& forward) { forward = {true, number, type, seconds}; });
    } else if (mode == 1) {
        bool any = false;
        each([&](Forward& forward) {
            if (!forward.number.empty()) forward.active = any = true;
        });
        if (!any) return Cme(errorText, kNotAllowed);
    } else if (mode == 0) {
        each([](Forward& forward) { forward.active = false; });
    } else {
        each([](Forward& forward) { forward = Forward{}; });
    }
    if (engine_) engine_->MarkChanged();
    return Handled::Ok;
}

Handled NetworkServices::RunClck(const std::string& args, std::string& info,
                                 std::string& errorText) {
    const auto fields = SplitFields(args);
    int mode = 0, serviceClass = 7;
    if (fields.size() < 2 || !FieldInt(fields, 1, 0, 2, &mode)) return Handled::Error;
    if (fields.size() > 3 && !fields[3].Empty() && !FieldInt(fields, 3, 1, 255, &serviceClass))
        return Handled::Error;
    const std::string facility = Upper(fields[0].text);
    const std::string password = fields.size() > 2 ? fields[2].text : "";

    if (const int group = BarringGroup(facility)) {
        const int bits = serviceClass & 7;
        if (mode == 2) {
            // One line with every barred class summed, so a reader of the first line sees
            // all of them.
            int barred = 0;
            for (int i = 0; i < kBarrings; ++i)
                if (group & (1 << i)) barred |= barred_[i];
            barred &= bits;
            Line(info, barred ? "+CLCK: 1," + std::to_string(barred)
                              : "+CLCK: 0," + std::to_string(bits));
            return Handled::Ok;
        }
        const int index = BarringIndex(facility);
        if (mode == 1 && index < 0) return Cme(errorText, kNotAllowed);  // groups only lift
        if (bits == 0) return Cme(errorText, kNotAllowed);
        if (password != barringPassword_) return Cme(errorText, kWrongPassword);
        if (mode == 1) {
            barred_[index] |= bits;
        } else {
            for (int i = 0; i < kBarrings; ++i)
                if (group & (1 << i)) barred_[i] &= ~bits;
        }
        if (engine_) engine_->MarkChanged();
        return Handled::Ok;
    }
    const int lock = LockIndex(facility);
    if (lock < 0) return Cme(errorText, kNotSupported);
    // A blocked SIM answers nothing about its PIN until it is unblocked.
    if (lock == 0 && tries_[0] == 0) return Cme(errorText, kPukRequired);
    if (mode == 2) {
        Line(info, std::string("+CLCK: ") + (locked_[lock] ? "1" : "0"));
        return Handled::Ok;
    }
    if (CheckPin(lock, password, errorText) != Handled::Ok) return Handled::Error;
    locked_[lock] = mode == 1;
    if (engine_) engine_->MarkChanged();
    return Handled::Ok;
}

Handled NetworkServices::RunCpwd(const std::string& args, std::string& errorText) {
    const auto fields = SplitFields(args);
    if (fields.size() < 3 || fields.size() > 4) return Handled::Error;
    const std::string facility = Upper(fields[0].text);
    const std::string& oldCode = fields[1].text;
    const std::string& newCode = fields[2].text;
    const int lock = LockIndex(facility);
    // Every barring facility shares the one network password.
    if (lock < 0 && !BarringGroup(facility)) return Cme(errorText, kNotSupported);
    // A SIM will not change a PIN whose request is switched off.
    if (lock >= 0 && lock <= 1 && tries_[lock] == 0)
        return Cme(errorText, lock == 0 ? kPukRequired : kPuk2Required);
    if (lock >= 0 && lock <= 1 && !locked_[lock]) return Cme(errorText, kNotAllowed);
    std::string& current = lock >= 0 ? codes_[lock] : barringPassword_;
    if (lock >= 0) {
        if (CheckPin(lock, oldCode, errorText) != Handled::Ok) return Handled::Error;
    } else if (oldCode != current) {
        return Cme(errorText, kWrongPassword);
    }
    if (lock >= 0 ? !AllDigits(newCode, 4, 8) : !AllDigits(newCode, 4, 4))
        return Cme(errorText, kNotAllowed);
    current = newCode;
    if (engine_) engine_->MarkChanged();
    return Handled::Ok;
}

std::string NetworkServices::Control(const std::string& command, const std::string& rest) {
    std::istringstream words(rest);
    if (command == "networks") {
        std::string list;
        words >> list;
        std::vector<Network> parsed;
        if (!ParseNetworks(list, &parsed))
            return "ERROR: networks needs CODE:STAT[,CODE:STAT...] with five-digit codes and "
                   "STAT 1 available, 2 current, 3 forbidden (or none)";
        networks_ = parsed;
        for (const Network& network : networks_)
            if (network.status == 2 && engine_) engine_->ChangeConfig().operatorCode = network.code;
    } else if (command == "forward") {
        std::string reasonText, classText, state, number;
        words >> reasonText >> classText >> state >> number;
        int reason = 0, serviceClass = 0;
        if (!ToInt(reasonText, &reason) || reason > 3 || !ToInt(classText, &serviceClass) ||
            serviceClass < 1 || serviceClass > 7 || (state != "on" && state != "off"))
            return "ERROR: forward needs REASON 0-3, CLASS 1-7, on|off and for on a NUMBER";
        if (!number.empty() && !IsDialable(number)) return "ERROR: forward needs a dialable NUMBER";
        for (int c = 0; c < kClasses; ++c)
            if (state == "on" && number.empty() && (serviceClass & kClassBits[c]) &&
                forwards_[reason][c].number.empty())
                return "ERROR: forward on needs a NUMBER";
        for (int c = 0; c < kClasses; ++c) {
            if (!(serviceClass & kClassBits[c])) continue;
            Forward& forward = forwards_[reason][c];
            if (state == "off") {
                forward.active = false;
                continue;
            }
            if (!number.empty()) {
                forward.number = number;
                forward.type = number[0] == '+' ? 145 : 129;
            }
            forward.active = true;
        }
    } else if (command == "barring") {
        std::string facility, classText, state;
        words >> facility >> classText >> state;
        facility = Upper(facility);
        const int group = BarringGroup(facility);
        int serviceClass = 0;
        if (!group || !ToInt(classText, &serviceClass) || serviceClass < 1 || serviceClass > 7 ||
            (state != "on" && state != "off") || (state == "on" && BarringIndex(facility) < 0))
            return "ERROR: barring needs AO|OI|OX|AI|IR (AB|AG|AC for off), CLASS 1-7, on|off";
        for (int i = 0; i < kBarrings; ++i) {
            if (!(group & (1 << i))) continue;
            barred_[i] = state == "on" ? barred_[i] | serviceClass : barred_[i] & ~serviceClass;
        }
    } else if (command == "password") {
        std::string facility, code;
        words >> facility >> code;
        facility = Upper(facility);
        const int lock = LockIndex(facility);
        if ((lock < 0 && !BarringGroup(facility)) || !AllDigits(code, 4, 8))
            return "ERROR: password needs SC|P2|PS|AB and a code of 4 to 8 digits";
        (lock >= 0 ? codes_[lock] : barringPassword_) = code;
    } else if (command == "sim-reset") {
        // What the PUK would do: both PINs get their tries back, the codes stay.
        tries_ = {kPinTries, kPinTries};
    } else {
        return {};
    }
    if (engine_) engine_->MarkChanged();
    return "OK";
}

std::string NetworkServices::ControlHelp() const {
    return "  networks CODE:STAT[,...] the networks a search finds (STAT 1 available, 2 current,\n"
           "                           3 forbidden), e.g. networks 20201:2,20205:1; or none\n"
           "  forward REASON CLASS on|off [NUMBER]   forwarding (reason 0 all, 1 busy,\n"
           "                           2 no reply, 3 not reachable; class 1 voice, 2 data, 4 fax)\n"
           "  barring FAC CLASS on|off call barring AO, OI, OX, AI, IR (AB, AG, AC lift groups)\n"
           "  password FAC CODE        the PIN (SC), PIN2 (P2), phone code (PS) or barring (AB)\n"
           "  sim-reset                unblock a SIM that three wrong PINs (or PIN2s) blocked\n";
}

void NetworkServices::Save(std::ostream& out) const {
    out << "net-networks ";
    if (networks_.empty()) out << "none";
    for (size_t i = 0; i < networks_.size(); ++i)
        out << (i ? "," : "") << networks_[i].code << ":" << networks_[i].status;
    out << "\nnet-mode " << engine_->Config().selectionMode << "\n";
    for (int r = 0; r < kReasons; ++r)
        for (int c = 0; c < kClasses; ++c) {
            const Forward& forward = forwards_[r][c];
            if (forward.number.empty()) continue;
            out << "net-forward " << r << " " << kClassBits[c] << " " << forward.number << " "
                << forward.type << " " << forward.seconds << " " << (forward.active ? 1 : 0)
                << "\n";
        }
    for (int i = 0; i < kBarrings; ++i)
        out << "net-barring " << kBarringNames[i] << " " << barred_[i] << "\n";
    for (int i = 0; i < kLocks; ++i)
        out << "net-lock " << kLockNames[i] << " " << (locked_[i] ? 1 : 0) << "\nnet-password "
            << kLockNames[i] << " " << codes_[i] << "\n";
    out << "net-password AB " << barringPassword_ << "\n";
    out << "net-tries " << tries_[0] << " " << tries_[1] << "\n";
    out << "net-bearer " << bearer_[0] << " " << bearer_[1] << " " << bearer_[2] << "\n";
    out << "net-hscsd " << hscsd_[0] << " " << hscsd_[1] << " " << hscsd_[2] << " " << hscsd_[3]
        << "\n";
}

bool NetworkServices::Load(const std::string& name, const std::string& rest) {
    if (!StartsWith(name, "net-")) return false;
    std::istringstream words(rest);
    // A damaged line is skipped; the value keeps what it had.
    if (name == "net-networks") {
        std::string list;
        words >> list;
        std::vector<Network> parsed;
        if (ParseNetworks(list, &parsed)) networks_ = parsed;
    } else if (name == "net-mode") {
        int mode = 0;
        if (words >> mode && (mode == 0 || mode == 1)) engine_->ChangeConfig().selectionMode = mode;
    } else if (name == "net-forward") {
        int reason = -1, bit = 0, type = 0, seconds = 0, active = 0;
        std::string number;
        if (words >> reason >> bit >> number >> type >> seconds >> active && reason >= 0 &&
            reason < kReasons && IsDialable(number))
            for (int c = 0; c < kClasses; ++c)
                if (kClassBits[c] == bit)
                    forwards_[reason][c] = {active != 0, number, type, seconds};
    } else if (name == "net-barring") {
        std::string facility;
        int bits = 0;
        const int index = (words >> facility >> bits) ? BarringIndex(facility) : -1;
        if (index >= 0) barred_[index] = bits & 7;
    } else if (name == "net-lock") {
        std::string facility;
        int on = 0;
        const int lock = (words >> facility >> on) ? LockIndex(facility) : -1;
        if (lock >= 0) locked_[lock] = on != 0;
    } else if (name == "net-password") {
        std::string facility, code;
        words >> facility >> code;
        const int lock = LockIndex(facility);
        if ((lock >= 0 || facility == "AB") && AllDigits(code, 4, 8))
            (lock >= 0 ? codes_[lock] : barringPassword_) = code;
    } else if (name == "net-tries") {
        std::array<int, 2> values{};
        if (words >> values[0] >> values[1] && values[0] >= 0 && values[0] <= kPinTries &&
            values[1] >= 0 && values[1] <= kPinTries)
            tries_ = values;
    } else if (name == "net-bearer") {
        std::array<int, 3> values{};
        if (words >> values[0] >> values[1] >> values[2]) bearer_ = values;
    } else if (name == "net-hscsd") {
        std::array<int, 4> values{};
        if (words >> values[0] >> values[1] >> values[2] >> values[3]) hscsd_ = values;
    }
    return true;
}

}  // namespace vqm::cardsim
