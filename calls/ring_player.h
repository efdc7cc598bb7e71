// The ring alert: loops the ring tone ("RingTonePath") at "RingToneLevel", climbing a step per
// cycle with "RingToneRaise", until the DialPad stops it. A machine without a sound device
// stays silent and says so once.
#pragma once

#include <QObject>
#include <QTimer>

class QSoundEffect;

namespace vqm {

class SettingsStore;

class RingPlayer : public QObject {
  public:
    explicit RingPlayer(SettingsStore& settings, QObject* parent = nullptr);
    ~RingPlayer() override;

    // Starting while ringing changes nothing; stopping while silent neither.
    void Start();
    void Stop();
    // Ringing as far as the DialPad is concerned, whether or not a device plays it.
    bool Ringing() const { return ringing_; }
    // The file and volume of the current ring (empty / 0 when silent).
    QString File() const { return file_; }
    float Volume() const;

  private:
    void NextCycle();
    bool HaveDevice();

    SettingsStore& settings_;
    QSoundEffect* effect_ = nullptr;
    QTimer cycleTimer_;
    QString file_;
    int level_ = 0, raise_ = 0, cycles_ = 0;
    bool ringing_ = false;
    bool warned_ = false;
};

}  // namespace vqm
