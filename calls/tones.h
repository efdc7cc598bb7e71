// The ring and alert tones: the program makes its own sound files (PCM WAV from synthesized
// tones) in the install folder when they are missing, and resolves the tone settings to files.
#pragma once

#include <string>

namespace vqm {

class SettingsStore;

enum class Tone { Ring1, Ring2, Music, Alarm1 };

// "Ring1.wav", "Ring2.wav", "Music.wav", "Alarm1.wav".
const char* ToneFileName(Tone tone);

// 16-bit mono PCM at this rate.
inline constexpr int kToneSampleRate = 22050;

// The tone as one loopable cycle of samples (ring cycles end in their pause).
std::string ToneSamples(Tone tone);
// A complete WAV file (RIFF header and data) of the tone.
std::string ToneWavFile(Tone tone);

// Writes every tone file the install folder lacks (through a flushed ".tmp" copy). Returns the
// number written; the folder is made when missing.
int EnsureToneFiles(SettingsStore& settings);

// The file of "RingTonePath" / "AlertTonePath" as a path here: missing means the install
// folder's "Ring1.wav" / "Alarm1.wav"; a value naming the handheld's own folders ("\Windows\...",
// "<install folder>...") or a bare file name means that file in the install folder.
std::u16string RingTonePath(SettingsStore& settings);
std::u16string AlertTonePath(SettingsStore& settings);

// The player's volume (0 to 1) for "RingToneLevel" (steps 0 to 5, clamped) after the ring has
// sounded for `cycles` whole cycles: with "RingToneRaise" the ring starts at step 1 and climbs
// a step per cycle up to the level.
float RingVolume(int level, int raise, int cycles);

}  // namespace vqm
