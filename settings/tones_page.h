// The Tones page of the Settings view (SETTINGS_TONES_PAGE): the ring tone ("RingTonePath": one
// of the program's Ring1.wav, Ring2.wav, Music.wav, or a WAV file of the user's), its volume
// step ("RingToneLevel", 0 to 5) and whether it climbs ("RingToneRaise"), and the message alert
// ("AlertTonePath"), each tone with a Play button. Every choice is stored at once; the ring
// player and the alerts read the settings each time they sound, so the next ring already uses it.
#pragma once

#include <QString>

#include "shell/main_window.h"
#include "shell/views.h"

class QComboBox;
class QSoundEffect;

namespace vqm {

inline constexpr int kRingToneId = 1194, kRingPlayId = 1195, kRingLevelId = 1196,
                     kRingRaiseId = 1197, kAlertToneId = 1198, kAlertPlayId = 1199;
// The object name of the file dialog that picks a WAV file of the user's.
inline constexpr char kToneFileDialogName[] = "TONE_FILE_DIALOG";

class TonesPage : public View {
  public:
    TonesPage(QWidget* parent, ShellContext& context);
    ~TonesPage() override;

    // WM_COMMAND with a Play button's id.
    long OnMessage(unsigned msg, long wParam, long lParam) override;

    // The file and volume (0 to 1) the last Play asked for, played or not (a machine without a
    // sound device stays silent).
    QString PlayedFile() const { return playedFile_; }
    float PlayedVolume() const { return playedVolume_; }

  private:
    QComboBox* AddToneChoice(int id, int y, int width, const char16_t* setting,
                             const QStringList& names);
    void Chosen(QComboBox* box, const char16_t* setting);
    void Play(QComboBox* box, float volume);
    QString InstallFolder();

    ShellContext& context_;
    QSoundEffect* effect_ = nullptr;
    QString playedFile_;
    float playedVolume_ = 0;
};

}  // namespace vqm
