#include "cardsim/call_waiting.h"

#include <cctype>
#include <ostream>
#include <vector>

#include "cardsim/arguments.h"
#include "cardsim/card_engine.h"

namespace vqm::cardsim {

namespace {

constexpr int kNotAllowed = 3;  // +CME ERROR code
constexpr int kAllClasses = 7;
constexpr int kClassBits[] = {1, 2, 4};

void Line(std::string& info, const std::string& text) {
    info += "\r\n" + text + "\r\n";
}

// A whole number from low to high; an absent field takes fallback.
bool FieldValue(const std::vector<Argument>& fields, size_t index, int low, int high, int fallback,
                int* value) {
    if (index >= fields.size() || fields[index].Empty()) {
        *value = fallback;
        return true;
    }
    const std::string& text = fields[index].text;
    if (fields[index].quoted || text.empty() || text.size() > 3) return false;
    for (char c : text)
        if (!std::isdigit(static_cast<unsigned char>(c))) return false;
    *value = std::stoi(text);
    return *value >= low && *value <= high;
}

}  // namespace

bool CallWaiting::Presenting() const {
    return !engine_ || !engine_->Standard() || presentation_;
}

Handled CallWaiting::Run(const std::string& upper, const std::string& original, std::string& info,
                         std::string& errorText) {
    if (upper.rfind("+CCWA", 0) != 0) return Handled::No;
    last_ = original;
    if (upper == "+CCWA?")
        return Line(info, "+CCWA: " + std::to_string(presentation_)), Handled::Ok;
    if (upper == "+CCWA=?") return Line(info, "+CCWA: (0,1)"), Handled::Ok;
    if (upper.rfind("+CCWA=", 0) != 0) return Handled::No;
    std::vector<Argument> fields;
    SplitArguments(upper.substr(6), &fields);
    int presentation = 0, mode = 0, serviceClass = kAllClasses;
    if (fields.size() > 3 || !FieldValue(fields, 0, 0, 1, presentation_, &presentation) ||
        !FieldValue(fields, 1, 0, 2, -1, &mode) ||
        !FieldValue(fields, 2, 1, 255, kAllClasses, &serviceClass) ||
        (serviceClass & kAllClasses) == 0) {
        errorText = engine_ ? engine_->MeError(kNotAllowed) : "ERROR";
        return Handled::Error;
    }
    if (!subscribed_) {
        errorText = engine_ ? engine_->MeError(kNotAllowed) : "ERROR";
        return Handled::Error;
    }
    presentation_ = presentation == 1;
    const int asked = serviceClass & kAllClasses;
    if (mode == 2) {
        bool any = false;
        for (int bit : kClassBits) {
            if (!(asked & bit) || !(classes_ & bit)) continue;
            Line(info, "+CCWA: 1," + std::to_string(bit));
            any = true;
        }
        // The card leaves the class out of a "not active" answer; a standard modem names it.
        if (!any)
            Line(info, engine_ && engine_->Standard() ? "+CCWA: 0," + std::to_string(asked)
                                                      : std::string("+CCWA: 0"));
    } else if (mode == 0 || mode == 1) {
        const int next = mode == 1 ? (classes_ | asked) : (classes_ & ~asked);
        if (next != classes_ && engine_) engine_->MarkChanged();
        classes_ = next;
    }
    return Handled::Ok;
}

std::string CallWaiting::Control(const std::string& command, const std::string& rest) {
    if (command == "call-waiting") {
        if (rest.empty()) {
            const char* setting = !subscribed_ ? "none" : (classes_ & 1) ? "on" : "off";
            return std::string("OK ") + setting + (last_.empty() ? "" : " last=" + last_);
        }
        if (rest == "none") {
            if (subscribed_ && engine_) engine_->MarkChanged();
            subscribed_ = false;
            return "OK";
        }
        if (rest != "on" && rest != "off") return "ERROR: call-waiting takes on, off or none";
        const int next = rest == "on" ? (classes_ | 1) : (classes_ & ~1);
        if ((next != classes_ || !subscribed_) && engine_) engine_->MarkChanged();
        classes_ = next;
        subscribed_ = true;
        return "OK";
    }
    if (command != "ring" || !engine_ || rest.empty()) return {};
    if (engine_->State() != CallState::Active || !subscribed_ || !(classes_ & 1)) return {};
    if (!engine_->RingWaiting(rest, Presenting(), Clock::now()))
        return "ERROR: a caller is waiting already";
    return "OK";
}

std::string CallWaiting::ControlHelp() const {
    return "  call-waiting [on|off|none]  the network's call waiting for voice: with it on, a\n"
           "                           ring during a call waits behind it (\"+CCWA:\"); none:\n"
           "                           not subscribed, +CCWA refused; alone, the setting and\n"
           "                           the last +CCWA command the card was sent\n";
}

void CallWaiting::Save(std::ostream& out) const {
    if (subscribed_)
        out << "call-waiting " << classes_ << "\n";
    else
        out << "call-waiting none\n";
}

bool CallWaiting::Load(const std::string& name, const std::string& rest) {
    if (name != "call-waiting") return false;
    subscribed_ = rest != "none";
    std::vector<Argument> fields{Argument{rest, false, true}};
    int value = 0;
    if (FieldValue(fields, 0, 0, kAllClasses, 0, &value)) classes_ = value;
    return true;
}

}  // namespace vqm::cardsim
