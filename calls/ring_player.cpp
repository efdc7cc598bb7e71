#include "calls/ring_player.h"

#include <QAudioDevice>
#include <QMediaDevices>
#include <QSoundEffect>
#include <QUrl>
#include <cstdio>

#include "calls/tones.h"
#include "support/settings_store.h"

namespace vqm {

namespace {
constexpr int kCycleMs = 3000;  // the length of one ring of the generated tones
}

RingPlayer::RingPlayer(SettingsStore& settings, QObject* parent)
    : QObject(parent), settings_(settings) {
    cycleTimer_.setInterval(kCycleMs);
    QObject::connect(&cycleTimer_, &QTimer::timeout, this, [this] { NextCycle(); });
}

RingPlayer::~RingPlayer() {
    Stop();
}

bool RingPlayer::HaveDevice() {
    if (!QMediaDevices::defaultAudioOutput().isNull()) return true;
    if (!warned_) {
        std::fprintf(stderr, "vqm-dialer: no sound device; the ring stays silent\n");
        warned_ = true;
    }
    return false;
}

float RingPlayer::Volume() const {
    return ringing_ ? RingVolume(level_, raise_, cycles_) : 0.0f;
}

void RingPlayer::Start() {
    if (ringing_) return;
    ringing_ = true;
    int32_t level = 3, raise = 0;
    GetSettingInt(settings_, u"RingToneLevel", &level);
    GetSettingInt(settings_, u"RingToneRaise", &raise);
    level_ = level;
    raise_ = raise;
    cycles_ = 0;
    file_ = QString::fromStdU16String(RingTonePath(settings_));
    if (raise_) cycleTimer_.start();
    if (!HaveDevice()) return;
    if (!effect_) effect_ = new QSoundEffect(this);
    effect_->setSource(QUrl::fromLocalFile(file_));
    effect_->setLoopCount(QSoundEffect::Infinite);
    effect_->setVolume(Volume());
    effect_->play();
}

void RingPlayer::Stop() {
    if (!ringing_) return;
    ringing_ = false;
    cycleTimer_.stop();
    if (effect_) effect_->stop();
}

void RingPlayer::NextCycle() {
    ++cycles_;
    if (effect_) effect_->setVolume(Volume());
    if (RingVolume(level_, raise_, cycles_) >= RingVolume(level_, 0, 0)) cycleTimer_.stop();
}

}  // namespace vqm
