#include "cardsim/core_commands.h"

#include <cstdlib>
#include <ostream>
#include <vector>

#include "cardsim/arguments.h"
#include "cardsim/card_engine.h"

namespace vqm::cardsim {

namespace {

// +CME ERROR codes of 27.007 the core answers with on a standard modem.
constexpr int kNotSupported = 4;
constexpr int kBadParameters = 50;

bool StartsWith(const std::string& text, const char* prefix) {
    return text.rfind(prefix, 0) == 0;
}

// One whole number in [low, high] as the only parameter of "NAME=<n>".
bool OneNumber(const std::string& args, int low, int high, int* value) {
    std::vector<Argument> fields;
    if (!SplitArguments(args, &fields) || fields.size() != 1 || fields[0].quoted ||
        fields[0].text.empty() || fields[0].text.size() > 9 ||
        fields[0].text.find_first_not_of("0123456789") != std::string::npos)
        return false;
    *value = std::atoi(fields[0].text.c_str());
    return *value >= low && *value <= high;
}

}  // namespace

std::string OperatorName(int code) {
    struct Named {
        int code;
        const char* name;
    };
    // The demo SIM's networks; anything else gets a made-up name a table will not know.
    static constexpr Named kNames[] = {
        {20201, "COSMOTE"}, {20205, "vodafone GR"}, {20210, "WIND GR"}, {20801, "Orange F"}};
    for (const Named& named : kNames)
        if (named.code == code) return named.name;
    return "NET " + std::to_string(code);
}

void CoreCommands::SetVolume(int level) {
    volume_ = level;
    if (engine_) engine_->MarkChanged();
}

Handled CoreCommands::Run(const std::string& upper, const std::string& original, std::string& info,
                          std::string& errorText) {
    (void)original;
    const CardEngine& engine = *engine_;
    const EngineConfig& config = engine.Config();
    const bool standard = config.dialect == Dialect::Standard;
    auto line = [&](const std::string& text) {
        info += "\r\n" + text + "\r\n";
        return Handled::Ok;
    };
    auto fail = [&](int code) {
        errorText = engine.MeError(code);
        return Handled::Error;
    };

    if (upper == "+GMI" || upper == "+CGMI") return line("Tavro Mobile Phones");
    if (upper == "+GMM" || upper == "+CGMM") return line("TAVRO CARD PHONE 2.0");
    // A standard modem names its revision in its own way, without the card's "SW" version.
    if (upper == "+GMR" || upper == "+CGMR") return line(standard ? "REV1" : config.firmware);
    if (upper == "+CGSN" || upper == "+GSN") return line("490154203237518");
    // Clients check that the radio is on; it always is while the card is powered.
    if (upper == "+CFUN?") return line("+CFUN: 1");
    if (upper == "+CFUN=1" || upper == "+CFUN=1,0") return Handled::Ok;
    if (upper == "+CIMI") return line("202015550123456");

    if (upper == "+CSQ") return line("+CSQ: " + std::to_string(config.signalQuality) + ",0");

    if (upper == "+COPS?") {
        const std::string mode = std::to_string(config.selectionMode);
        // The card reports the bare code; a standard modem quotes it, in the format chosen.
        if (!standard) return line("+COPS: " + mode + ",2," + std::to_string(config.operatorCode));
        const std::string name = operatorFormat_ == 2 ? std::to_string(config.operatorCode)
                                                      : OperatorName(config.operatorCode);
        return line("+COPS: " + mode + "," + std::to_string(operatorFormat_) + ",\"" + name + "\"");
    }
    // Only the format is this group's; selection and the network list are the network services'.
    if (standard && StartsWith(upper, "+COPS=3,")) {
        int format = 0;
        if (!OneNumber(upper.substr(8), 0, 2, &format)) return fail(kNotSupported);
        operatorFormat_ = format;
        return Handled::Ok;
    }

    if (upper == "+CLVL?") return line("+CLVL: " + std::to_string(volume_));
    if (upper == "+CLVL=?") return line("+CLVL: (0-10)");
    if (StartsWith(upper, "+CLVL=")) {
        int level = 0;
        if (!OneNumber(upper.substr(6), 0, 10, &level)) return fail(kBadParameters);
        SetVolume(level);
        return Handled::Ok;
    }

    if (upper == "+CLCC") {
        if (engine.State() == CallState::None) return Handled::Ok;
        const std::string& number = engine.CallNumber();
        const bool international = !number.empty() && number[0] == '+';
        return line("+CLCC: 1," + std::string(engine.Outgoing() ? "0" : "1") + "," +
                    std::to_string(static_cast<int>(engine.State())) + ",0,0,\"" + number + "\"," +
                    (international ? "145" : "129"));
    }
    return Handled::No;
}

void CoreCommands::Save(std::ostream& out) const {
    out << "volume " << volume_ << "\n";
}

bool CoreCommands::Load(const std::string& name, const std::string& rest) {
    if (name != "volume") return false;
    int level = 0;
    if (OneNumber(rest, 0, 10, &level)) volume_ = level;
    return true;
}

}  // namespace vqm::cardsim
