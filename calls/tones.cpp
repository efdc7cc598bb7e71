#include "calls/tones.h"

#include <cmath>
#include <cstdint>
#include <filesystem>
#include <numbers>
#include <vector>

#include "support/files.h"
#include "support/settings_store.h"
#include "support/text.h"

namespace vqm {

namespace {

constexpr double kRampSeconds = 0.006;  // soft edges: a hard start or stop clicks

struct Segment {
    double seconds;
    std::vector<double> frequencies;  // empty: silence
    double amplitude;
    double trillHz = 0;  // alternates between the two frequencies at this rate
};

void Render(const Segment& segment, std::vector<int16_t>& out) {
    const int count = static_cast<int>(segment.seconds * kToneSampleRate);
    const int ramp = static_cast<int>(kRampSeconds * kToneSampleRate);
    for (int i = 0; i < count; ++i) {
        double value = 0;
        const double t = static_cast<double>(i) / kToneSampleRate;
        if (!segment.frequencies.empty()) {
            if (segment.trillHz > 0 && segment.frequencies.size() == 2) {
                const bool first = std::fmod(t * segment.trillHz, 1.0) < 0.5;
                value = std::sin(2 * std::numbers::pi * segment.frequencies[first ? 0 : 1] * t);
            } else {
                for (double f : segment.frequencies)
                    value += std::sin(2 * std::numbers::pi * f * t);
                value /= static_cast<double>(segment.frequencies.size());
            }
            double envelope = 1.0;
            if (i < ramp) envelope = static_cast<double>(i) / ramp;
            if (count - i < ramp) envelope = static_cast<double>(count - i) / ramp;
            value *= envelope * segment.amplitude;
        }
        out.push_back(static_cast<int16_t>(std::lround(value * 32767.0)));
    }
}

std::vector<Segment> Score(Tone tone) {
    switch (tone) {
        case Tone::Ring1:
            // Two short bursts of a dual tone, then the pause: a telephone's ring.
            return {{0.4, {400, 450}, 0.8}, {0.2, {}, 0}, {0.4, {400, 450}, 0.8}, {2.0, {}, 0}};
        case Tone::Ring2:
            // An electronic trill.
            return {{1.0, {1300, 1650}, 0.6, 16}, {2.0, {}, 0}};
        case Tone::Music: {
            // A little rising and falling tune in C major.
            std::vector<Segment> notes;
            for (double f : {523.25, 659.25, 783.99, 1046.50, 783.99, 659.25, 523.25, 659.25})
                notes.push_back({0.22, {f}, 0.7});
            notes.push_back({0.9, {}, 0});
            return notes;
        }
        case Tone::Alarm1:
            return {{0.12, {880}, 0.7}, {0.08, {}, 0},       {0.12, {880}, 0.7},
                    {0.08, {}, 0},      {0.12, {1175}, 0.7}, {0.3, {}, 0}};
    }
    return {};
}

void PutLe(std::string& out, uint32_t value, int bytes) {
    for (int i = 0; i < bytes; ++i)
        out.push_back(static_cast<char>((value >> (8 * i)) & 0xFF));
}

std::string InstallFolder(SettingsStore& settings) {
    char16_t folder[1024];
    if (!GetInstallPath(settings, folder, 1024)) return DefaultInstallPath();
    return Utf16ToUtf8(folder);
}

std::u16string ResolveTone(SettingsStore& settings, const char16_t* name, const char* defaultFile) {
    const std::u16string folder = Utf8ToUtf16(InstallFolder(settings));
    char16_t value[1024] = {};
    if (!GetSettingString(settings, name, value, 1024) || !value[0])
        return folder + Utf8ToUtf16(defaultFile);
    std::u16string text = value;
    const std::u16string installMark = u"<install folder>";
    if (text.rfind(installMark, 0) == 0) return folder + text.substr(installMark.size());
    // A path of the handheld ("\Windows\Alarm1.wav"): the file of that name made here.
    if (text.find(u'\\') != std::u16string::npos)
        return folder + text.substr(text.rfind(u'\\') + 1);
    if (text.find(u'/') == std::u16string::npos) return folder + text;
    return text;
}

}  // namespace

const char* ToneFileName(Tone tone) {
    switch (tone) {
        case Tone::Ring1:
            return "Ring1.wav";
        case Tone::Ring2:
            return "Ring2.wav";
        case Tone::Music:
            return "Music.wav";
        case Tone::Alarm1:
            return "Alarm1.wav";
    }
    return "";
}

std::string ToneSamples(Tone tone) {
    std::vector<int16_t> samples;
    for (const Segment& segment : Score(tone))
        Render(segment, samples);
    std::string bytes;
    bytes.reserve(samples.size() * 2);
    for (int16_t s : samples)
        PutLe(bytes, static_cast<uint16_t>(s), 2);
    return bytes;
}

std::string ToneWavFile(Tone tone) {
    const std::string data = ToneSamples(tone);
    std::string file = "RIFF";
    PutLe(file, static_cast<uint32_t>(36 + data.size()), 4);
    file += "WAVEfmt ";
    PutLe(file, 16, 4);                   // format chunk size
    PutLe(file, 1, 2);                    // PCM
    PutLe(file, 1, 2);                    // mono
    PutLe(file, kToneSampleRate, 4);      // samples a second
    PutLe(file, kToneSampleRate * 2, 4);  // bytes a second
    PutLe(file, 2, 2);                    // bytes a frame
    PutLe(file, 16, 2);                   // bits a sample
    file += "data";
    PutLe(file, static_cast<uint32_t>(data.size()), 4);
    return file + data;
}

int EnsureToneFiles(SettingsStore& settings) {
    namespace fs = std::filesystem;
    const fs::path folder = InstallFolder(settings);
    std::error_code error;
    fs::create_directories(folder, error);
    int written = 0;
    for (Tone tone : {Tone::Ring1, Tone::Ring2, Tone::Music, Tone::Alarm1}) {
        const fs::path path = folder / ToneFileName(tone);
        if (fs::exists(path, error)) continue;
        if (ReplaceFile(path.string(), ToneWavFile(tone))) ++written;
    }
    return written;
}

std::u16string RingTonePath(SettingsStore& settings) {
    return ResolveTone(settings, u"RingTonePath", "Ring1.wav");
}

std::u16string AlertTonePath(SettingsStore& settings) {
    return ResolveTone(settings, u"AlertTonePath", "Alarm1.wav");
}

float RingVolume(int level, int raise, int cycles) {
    if (level < 0) level = 0;
    if (level > 5) level = 5;
    int step = level;
    if (raise && level > 0) {
        step = 1 + (cycles < 0 ? 0 : cycles);
        if (step > level) step = level;
    }
    return static_cast<float>(step) / 5.0f;
}

}  // namespace vqm
