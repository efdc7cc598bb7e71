#include "calls/dial_pad_view.h"

#include <QAbstractButton>
#include <QApplication>
#include <QKeyEvent>
#include <QLabel>
#include <QLinearGradient>
#include <QMouseEvent>
#include <QPainter>
#include <QPainterPath>
#include <QSignalBlocker>
#include <QSlider>

#include "calls/alerts.h"
#include "calls/tones.h"
#include "link/link.h"
#include "shell/messages.h"
#include "shell/notifier.h"
#include "shell/ui_log.h"
#include "support/local_socket.h"

namespace vqm {

namespace {

// A message of this view alone: run the function wParam points to (a handler from another
// thread, waited for by its sender).
constexpr unsigned kMsgRunOnPad = 0x8101;

constexpr int kPadWidth = 240, kPadHeight = 268;
// Read-only texts are painted on this grey.
const QColor kGrey(132, 132, 132);
const QRect kScreen(6, 28, 228, 80);
const QPoint kGaugeAt(197, 35);
constexpr int kGaugeCellWidth = 8, kGaugeCellHeight = 44;
const QRect kNoticeIcon(8, 113, 16, 16);
const QRect kNoticeLine(28, 112, 206, 18);
// The smallest text a long status or number is shrunk to; still readable on the handheld.
constexpr int kMinTextPixels = 8;
// How long the display flashes when the number is full.
constexpr int kFullFlashMs = 250;
const QColor kFullFlash(190, 40, 40);

enum class KeyLook { Digit, Call, End, Function, Power };

const char* const kLetters[10] = {"+",   "",    "ABC",  "DEF", "GHI",
                                  "JKL", "MNO", "PQRS", "TUV", "WXYZ"};

// A key of the pad, drawn by the program: raised when released, sunk and darker when pressed.
class PadKey : public QAbstractButton {
  public:
    PadKey(QWidget* parent, const QString& label, const QString& sub, KeyLook look)
        : QAbstractButton(parent), sub_(sub), look_(look) {
        setText(label);
        setFocusPolicy(Qt::NoFocus);
    }

  protected:
    void paintEvent(QPaintEvent*) override {
        QPainter p(this);
        p.setRenderHint(QPainter::Antialiasing);
        const bool down = isDown();
        QColor top, bottom, ink = QColor(20, 24, 30);
        switch (look_) {
            case KeyLook::Digit:
                top = QColor(238, 240, 244);
                bottom = QColor(176, 182, 192);
                break;
            case KeyLook::Call:
                top = QColor(120, 214, 120);
                bottom = QColor(30, 140, 50);
                ink = Qt::white;
                break;
            case KeyLook::End:
                top = QColor(240, 120, 110);
                bottom = QColor(170, 30, 30);
                ink = Qt::white;
                break;
            case KeyLook::Function:
                top = QColor(150, 168, 196);
                bottom = QColor(70, 88, 120);
                ink = Qt::white;
                break;
            case KeyLook::Power:
                top = QColor(110, 116, 126);
                bottom = QColor(50, 54, 62);
                ink = QColor(255, 190, 60);
                break;
        }
        if (!isEnabled()) {
            top = top.darker(150);
            bottom = bottom.darker(150);
            ink = ink.darker(170);
        }
        if (down) {
            std::swap(top, bottom);
            top = top.darker(115);
        }
        const QRectF r = QRectF(rect()).adjusted(0.5, 0.5, -0.5, -0.5);
        const qreal radius = look_ == KeyLook::Power ? r.height() / 2 : 6;
        // The shadow under a released key, gone when it is pressed in.
        if (!down) {
            p.setPen(Qt::NoPen);
            p.setBrush(QColor(0, 0, 0, 90));
            p.drawRoundedRect(r.translated(0, 1.5), radius, radius);
        }
        QLinearGradient fill(r.topLeft(), r.bottomLeft());
        fill.setColorAt(0, top);
        fill.setColorAt(1, bottom);
        p.setBrush(fill);
        p.setPen(QPen(bottom.darker(160), 1));
        p.drawRoundedRect(r.adjusted(0, down ? 1 : 0, 0, down ? 1 : -1), radius, radius);

        p.setPen(ink);
        const QRect area = rect().translated(0, down ? 1 : 0);
        if (look_ == KeyLook::Power) {
            // The power sign: an open ring and a stroke through its gap.
            QPen pen(ink, 2, Qt::SolidLine, Qt::RoundCap);
            p.setPen(pen);
            const QRectF ring = QRectF(area).adjusted(5, 5, -5, -5);
            p.drawArc(ring, 120 * 16, 300 * 16);
            p.drawLine(QPointF(ring.center().x(), ring.top() - 1),
                       QPointF(ring.center().x(), ring.center().y()));
            return;
        }
        QFont font = p.font();
        font.setBold(true);
        font.setPixelSize(look_ == KeyLook::Digit ? 15 : 10);
        p.setFont(font);
        if (sub_.isEmpty()) {
            p.drawText(area, Qt::AlignCenter, text());
            return;
        }
        p.drawText(area.adjusted(10, 0, 0, 0), Qt::AlignLeft | Qt::AlignVCenter, text());
        font.setBold(false);
        font.setPixelSize(9);
        p.setFont(font);
        p.setPen(QColor(70, 78, 92));
        p.drawText(area.adjusted(0, 0, -9, 0), Qt::AlignRight | Qt::AlignVCenter, sub_);
    }

  private:
    QString sub_;
    KeyLook look_;
};

QLabel* ReadOnlyText(QWidget* parent, int id, const QRect& where, int pixels, bool bold,
                     Qt::Alignment align, const QColor& ink) {
    auto* label = new FittedText(parent);
    // Caller ids come from the network: whatever they hold is shown as typed, never as markup.
    label->setTextFormat(Qt::PlainText);
    SetControlId(label, id);
    label->setGeometry(where);
    label->setAlignment(align | Qt::AlignVCenter);
    label->setAutoFillBackground(true);
    QPalette palette = label->palette();
    palette.setColor(QPalette::Window, kGrey);
    palette.setColor(QPalette::WindowText, ink);
    label->setPalette(palette);
    QFont font = label->font();
    font.setPixelSize(pixels);
    font.setBold(bold);
    label->setFont(font);
    return label;
}

// The phone's body: a dark case with a grey screen, drawn once.
QPixmap PaintBackground() {
    QPixmap pixmap(kPadWidth, kPadHeight);
    pixmap.fill(Qt::transparent);
    QPainter p(&pixmap);
    p.setRenderHint(QPainter::Antialiasing);
    QLinearGradient body(0, 0, 0, kPadHeight);
    body.setColorAt(0, QColor(58, 66, 80));
    body.setColorAt(1, QColor(22, 26, 34));
    p.setPen(Qt::NoPen);
    p.setBrush(body);
    p.drawRoundedRect(QRectF(0.5, 0.5, kPadWidth - 1, kPadHeight - 1), 14, 14);
    // Brand across the top, right of the power button.
    QFont font = p.font();
    font.setPixelSize(11);
    font.setBold(true);
    font.setLetterSpacing(QFont::AbsoluteSpacing, 2);
    p.setFont(font);
    p.setPen(QColor(190, 198, 212));
    p.drawText(QRect(30, 4, 180, 20), Qt::AlignCenter, "VQM  PHONE");
    // The screen: a bezel and the grey of the read-only texts.
    p.setBrush(QColor(12, 14, 18));
    p.drawRoundedRect(QRectF(kScreen).adjusted(-3, -3, 3, 3), 6, 6);
    p.setBrush(kGrey);
    p.drawRect(kScreen);
    // An antenna beside the signal gauge.
    p.setPen(QPen(QColor(16, 18, 22), 1.5));
    const qreal ax = kGaugeAt.x() - 7;
    p.drawLine(QPointF(ax, 38), QPointF(ax, 52));
    p.drawLine(QPointF(ax - 4, 37), QPointF(ax, 43));
    p.drawLine(QPointF(ax + 4, 37), QPointF(ax, 43));
    // The earpiece slot under the keys.
    p.setPen(Qt::NoPen);
    p.setBrush(QColor(12, 14, 18));
    p.drawRoundedRect(QRectF(100, 262, 40, 3), 1.5, 1.5);
    return pixmap;
}

// The signal gauge: a strip of five 8 x 44 cells, cell n showing n of four stacked bars lit.
QPixmap PaintGauge() {
    QPixmap strip(kGaugeCellWidth * 5, kGaugeCellHeight);
    strip.fill(kGrey);
    QPainter p(&strip);
    for (int cell = 0; cell < 5; ++cell) {
        for (int bar = 0; bar < 4; ++bar) {
            const QRect r(cell * kGaugeCellWidth + 1, kGaugeCellHeight - 9 - bar * 11, 6, 8);
            if (bar < cell) {
                p.fillRect(r, QColor(16, 18, 22));
            } else {
                p.setPen(QColor(100, 100, 100));
                p.setBrush(Qt::NoBrush);
                p.drawRect(r.adjusted(0, 0, -1, -1));
            }
        }
    }
    return strip;
}

// Icon 106: a small envelope with a red mark, for the notification line.
void PaintNoticeIcon(QPainter& p, const QRect& r) {
    p.setRenderHint(QPainter::Antialiasing);
    p.setPen(QPen(QColor(40, 40, 40), 1));
    p.setBrush(QColor(250, 246, 220));
    const QRectF envelope = QRectF(r).adjusted(0.5, 3.5, -2.5, -1.5);
    p.drawRect(envelope);
    p.drawLine(envelope.topLeft(), envelope.center());
    p.drawLine(envelope.topRight(), envelope.center());
    p.setPen(Qt::NoPen);
    p.setBrush(QColor(220, 40, 40));
    p.drawEllipse(QRectF(r.right() - 6, r.top(), 7, 7));
}

}  // namespace

QFont FittedText::ShownFont() const {
    QFont shown = font();
    const int room = contentsRect().width();
    while (shown.pixelSize() > kMinTextPixels &&
           QFontMetrics(shown).horizontalAdvance(text()) > room)
        shown.setPixelSize(shown.pixelSize() - 1);
    return shown;
}

void FittedText::paintEvent(QPaintEvent*) {
    // The background is filled by the label's own palette before this.
    QPainter p(this);
    p.setFont(ShownFont());
    p.setPen(palette().color(QPalette::WindowText));
    p.drawText(contentsRect(), static_cast<int>(alignment()) | Qt::TextSingleLine, text());
}

DialPadView::DialPadView(QWidget* parent, ShellContext& context, CallLog* callLog,
                         PhonebookCaches* caches)
    : View(parent),
      context_(context),
      ownCallLog_(callLog ? nullptr : std::make_unique<CallLog>(context.settings)),
      ownCaches_(caches ? nullptr : std::make_unique<PhonebookCaches>(context.settings)),
      eventLog_(EventLogPath(context.settings)),
      events_(std::make_unique<UnsolicitedEvents>(eventLog_)),
      ring_(context.settings, this),
      background_(PaintBackground()),
      gauge_(PaintGauge()),
      pad_(context.link, context.settings, callLog ? *callLog : *ownCallLog_,
           caches ? *caches : *ownCaches_, *this) {
    setFocusPolicy(Qt::StrongFocus);
    BuildControls();
    EnsureToneFiles(context.settings);
    InstallCallHandlers(*events_, pad_,
                        [this](const std::function<void()>& work) { RunOnPadThread(work); });
    // Handlers are in place before the card watch opens the link, so the listener may
    // dispatch from its first pass.
    if (!context_.link.events) {
        context_.link.events = events_.get();
        ownsLinkEvents_ = true;
    }
    for (int id : {kTimerDialPad, kTimerPowerKey}) {
        auto* timer = new QTimer(this);
        QObject::connect(timer, &QTimer::timeout, this,
                         [this, id] { pad_.OnMessage(kWmTimer, id, 0); });
        timers_[id] = timer;
    }
}

DialPadView::~DialPadView() {
    pad_.Destroy();
    if (ownsLinkEvents_ && context_.link.events == events_.get()) context_.link.events = nullptr;
}

void DialPadView::BuildControls() {
    auto* power = new PadKey(this, "", "", KeyLook::Power);
    SetControlId(power, kPowerKeyId);
    power->setGeometry(6, 4, 20, 20);
    power->setToolTip("Hold to power the card up or down");
    QObject::connect(power, &QAbstractButton::pressed, this,
                     [this] { pad_.OnMessage(kWmLButtonDown, kPowerKeyId, 0); });
    QObject::connect(power, &QAbstractButton::released, this,
                     [this] { pad_.OnMessage(kWmLButtonUp, kPowerKeyId, 0); });

    const QColor ink(16, 18, 22);
    const int textWidth = kGaugeAt.x() - kScreen.left() - 20;  // clear of the antenna
    ReadOnlyText(this, kStatusLine1Id, QRect(kScreen.left() + 4, 31, textWidth, 16), 12, true,
                 Qt::AlignLeft, ink);
    ReadOnlyText(this, kStatusLine2Id, QRect(kScreen.left() + 4, 47, textWidth, 15), 11, false,
                 Qt::AlignLeft, ink);
    ReadOnlyText(this, kStatusLine3Id, QRect(kScreen.left() + 4, 62, textWidth, 15), 11, false,
                 Qt::AlignLeft, ink);
    ReadOnlyText(this, kNumberDisplayId, QRect(kScreen.left() + 4, 81, kScreen.width() - 8, 24), 19,
                 true, Qt::AlignRight, QColor(250, 250, 250));
    auto* notice = ReadOnlyText(this, kNotificationLineId, kNoticeLine, 11, true, Qt::AlignLeft,
                                QColor(255, 214, 120));
    QPalette palette = notice->palette();
    palette.setColor(QPalette::Window, QColor(0, 0, 0, 0));
    notice->setPalette(palette);
    notice->setCursor(Qt::PointingHandCursor);
    notice->setAttribute(Qt::WA_TransparentForMouseEvents);

    auto addKey = [this](int id, const QString& label, const QString& sub, KeyLook look,
                         const QRect& where) {
        auto* key = new PadKey(this, label, sub, look);
        SetControlId(key, id);
        key->setGeometry(where);
        QObject::connect(key, &QAbstractButton::clicked, this, [this, id] { PressKey(id); });
    };
    // The call row: Call, Contacts, Clear, End.
    const int rowY = 134, rowH = 25, fnW = 54;
    addKey(kKeyCallId, "Call", "", KeyLook::Call, QRect(6, rowY, fnW, rowH));
    addKey(kKeyContactsId, "Contacts", "", KeyLook::Function, QRect(64, rowY, fnW, rowH));
    addKey(kKeyClearId, "Clear", "", KeyLook::Function, QRect(122, rowY, fnW, rowH));
    addKey(kKeyEndId, "End", "", KeyLook::End, QRect(180, rowY, fnW, rowH));
    // The twelve keys, three a row, as on a phone.
    const int ids[12] = {kKeyZeroId + 1, kKeyZeroId + 2, kKeyZeroId + 3, kKeyZeroId + 4,
                         kKeyZeroId + 5, kKeyZeroId + 6, kKeyZeroId + 7, kKeyZeroId + 8,
                         kKeyZeroId + 9, kKeyStarId,     kKeyZeroId,     kKeyHashId};
    for (int i = 0; i < 12; ++i) {
        const int id = ids[i];
        QString label, sub;
        if (id == kKeyStarId) {
            label = "*";
        } else if (id == kKeyHashId) {
            label = "#";
        } else {
            const int digit = id - kKeyZeroId;
            label = QString::number(digit);
            sub = kLetters[digit];
        }
        addKey(id, label, sub, KeyLook::Digit, QRect(6 + (i % 3) * 77, 165 + (i / 3) * 24, 74, 21));
    }

    slider_ = new QSlider(Qt::Horizontal, this);
    SetControlId(slider_, kVolumeSliderId);
    slider_->setObjectName("msctls_trackbar32");
    slider_->setRange(1, kMaxVolumeLevel);
    slider_->setPageStep(1);
    slider_->setGeometry(30, 270, 204, 22);
    slider_->setToolTip("Speaker volume");
    // Steps and clicks report as line/page codes (below 4); a drag reports once, at its end.
    QObject::connect(slider_, &QSlider::valueChanged, this, [this](int) {
        if (!slider_->isSliderDown()) pad_.OnMessage(kWmHScroll, 0, 0);
    });
    QObject::connect(slider_, &QSlider::sliderReleased, this,
                     [this] { pad_.OnMessage(kWmHScroll, kTbEndTrack, 0); });
}

MessageLayer& DialPadView::Messages() {
    if (context_.messages) return *context_.messages;
    if (!ownMessages_)
        ownMessages_ = std::make_unique<MessageLayer>([this] {
            QMetaObject::invokeMethod(
                this, [this] { ownMessages_->DeliverPending(); }, Qt::QueuedConnection);
        });
    return *ownMessages_;
}

void DialPadView::RunOnPadThread(const std::function<void()>& work) {
    MessageLayer& messages = Messages();
    if (messages.OnOwnerThread()) {
        work();
        return;
    }
    messages.Send(this, kMsgRunOnPad, reinterpret_cast<long>(&work), 0);
}

long DialPadView::OnMessage(unsigned msg, long wParam, long lParam) {
    switch (msg) {
        case kMsgRunOnPad:
            if (wParam) (*reinterpret_cast<const std::function<void()>*>(wParam))();
            return 0;
        case kMsgViewShown:
            TakeFocus();
            return pad_.OnMessage(msg, wParam, lParam);
        case kMsgCardStateChanged: {
            // The main window tells that the state changed; the state itself is its own.
            const long state = context_.mainWindow ? context_.mainWindow->App().cardState : wParam;
            return pad_.OnMessage(msg, state, lParam);
        }
        default:
            return pad_.OnMessage(msg, wParam, lParam);
    }
}

// Drawing and input

void DialPadView::paintEvent(QPaintEvent*) {
    QPainter p(this);
    p.fillRect(rect(), QColor(22, 26, 34));
    p.drawPixmap(0, 0, background_);
    const int cell = bars_ < 0 ? 0 : (bars_ > 4 ? 4 : bars_);
    p.drawPixmap(kGaugeAt, gauge_,
                 QRect(cell * kGaugeCellWidth, 0, kGaugeCellWidth, kGaugeCellHeight));
    if (iconShown_) PaintNoticeIcon(p, kNoticeIcon);
    // A speaker beside the volume slider.
    p.setRenderHint(QPainter::Antialiasing);
    p.setPen(Qt::NoPen);
    p.setBrush(QColor(190, 198, 212));
    QPainterPath speaker;
    speaker.moveTo(8, 277);
    speaker.lineTo(12, 277);
    speaker.lineTo(17, 272);
    speaker.lineTo(17, 290);
    speaker.lineTo(12, 285);
    speaker.lineTo(8, 285);
    speaker.closeSubpath();
    p.drawPath(speaker);
    p.setPen(QPen(QColor(190, 198, 212), 1.5));
    p.setBrush(Qt::NoBrush);
    p.drawArc(QRectF(14, 274, 8, 14), -50 * 16, 100 * 16);
    p.drawArc(QRectF(13, 271, 13, 20), -50 * 16, 100 * 16);
}

void DialPadView::mousePressEvent(QMouseEvent* event) {
    // A tap on the notice (its icon or its line) opens what it speaks of.
    const QPoint at = event->position().toPoint();
    if (kNoticeIcon.contains(at) || kNoticeLine.contains(at))
        pad_.OnMessage(kWmCommand, kCmdNotificationTapped, 0);
    View::mousePressEvent(event);
}

void DialPadView::keyPressEvent(QKeyEvent* event) {
    const int key = event->key();
    int id = 0;
    if (key >= Qt::Key_0 && key <= Qt::Key_9) id = kKeyZeroId + (key - Qt::Key_0);
    if (key == Qt::Key_Asterisk) id = kKeyStarId;
    if (key == Qt::Key_NumberSign) id = kKeyHashId;
    if (key == Qt::Key_Return || key == Qt::Key_Enter) id = kKeyCallId;
    if (key == Qt::Key_Escape) id = kKeyEndId;
    if (key == Qt::Key_Backspace) id = kKeyClearId;
    QWidget* control = id ? FindControl(this, id) : nullptr;
    if (control && control->isEnabled()) {
        PressKey(id);
        return;
    }
    View::keyPressEvent(event);
}

void DialPadView::changeEvent(QEvent* event) {
    View::changeEvent(event);
    // A busy window is disabled and loses its focus; a window coming back may have none.
    if (event->type() == QEvent::EnabledChange && isEnabled()) TakeFocus();
    if (event->type() == QEvent::ActivationChange && isActiveWindow()) {
        QWidget* focused = window()->focusWidget();
        if (!focused || (focused != this && !isAncestorOf(focused))) TakeFocus();
    }
}

void DialPadView::TakeFocus() {
    if (isVisible() && isEnabled()) setFocus(Qt::OtherFocusReason);
}

void DialPadView::PressKey(int id) {
    const bool typing = (id >= kKeyZeroId && id <= kKeyHashId) && pad_.CallState() == kCallIdle &&
                        !pad_.NumberWasDialled();
    const int before = pad_.Number().count;
    pad_.OnMessage(kWmCommand, id, 0);
    // The 20th character is kept out; the person typing it learns that the number is full.
    if (typing && before >= 20 && pad_.Number().count == before) SignalNumberFull();
}

void DialPadView::SignalNumberFull() {
    ++fullSignals_;
    QApplication::beep();
    auto* display = qobject_cast<QLabel*>(FindControl(this, kNumberDisplayId));
    if (!display || flashing_) return;
    flashing_ = true;
    QPalette flash = display->palette();
    const QColor normal = flash.color(QPalette::Window);
    flash.setColor(QPalette::Window, kFullFlash);
    display->setPalette(flash);
    QTimer::singleShot(kFullFlashMs, display, [this, display, normal] {
        QPalette back = display->palette();
        back.setColor(QPalette::Window, normal);
        display->setPalette(back);
        flashing_ = false;
    });
}

// DialPadUi

void DialPadView::SetControlText(int id, const std::u16string& text) {
    auto* label = qobject_cast<QLabel*>(FindControl(this, id));
    if (!label) return;
    const QString shown = QString::fromStdU16String(text);
    // Every status line a person sees goes into the ui log, so a run can be followed from it.
    const bool statusLine = id == kStatusLine1Id || id == kStatusLine2Id || id == kStatusLine3Id;
    if (statusLine && context_.uiLog && !text.empty() && label->text() != shown)
        context_.uiLog->Line("status", text);
    label->setText(shown);
}

std::u16string DialPadView::ControlText(int id) {
    if (auto* label = qobject_cast<QLabel*>(FindControl(this, id)))
        return label->text().toStdU16String();
    return {};
}

void DialPadView::EnableControl(int id, bool enable) {
    if (QWidget* control = FindControl(this, id)) control->setEnabled(enable);
}

bool DialPadView::ControlEnabled(int id) {
    QWidget* control = FindControl(this, id);
    return control && control->isEnabled();
}

void DialPadView::SetSliderPosition(int position) {
    const QSignalBlocker quiet(slider_);
    slider_->setValue(position);
}

int DialPadView::SliderPosition() {
    return slider_->value();
}

void DialPadView::SetSignalBars(int bars) {
    bars_ = bars;
    update();
}

void DialPadView::ShowNotificationIcon(bool show) {
    iconShown_ = show;
    update(kNoticeIcon);
}

void DialPadView::StartTimer(int id, int ms) {
    if (auto it = timers_.find(id); it != timers_.end()) it->second->start(ms);
}

void DialPadView::StopTimer(int id) {
    if (auto it = timers_.find(id); it != timers_.end()) it->second->stop();
}

void DialPadView::SwitchToView(int index) {
    if (context_.mainWindow && index >= 0 && index < 6)
        context_.mainWindow->Command(kCmdViewFirst + index);
}

void DialPadView::ShowDialPad() {
    if (context_.mainWindow) context_.mainWindow->ShowDialPad();
}

void DialPadView::BringDialPadForward() {
    if (!context_.mainWindow) return;
    context_.mainWindow->Foreground();
    context_.mainWindow->ShowDialPad();
}

void DialPadView::ShowStatus(const std::u16string& first, const std::u16string& second) {
    if (context_.mainWindow) {
        context_.mainWindow->ShowStatus(first, second);
        return;
    }
    SetControlText(kStatusLine1Id, first);
    SetControlText(kStatusLine2Id, second);
}

void DialPadView::DisplayOnIfOff() {
    // The display key toggles; it is pressed only when the program had switched it off.
    if (context_.mainWindow && context_.mainWindow->App().displayOff)
        context_.mainWindow->OnMessage(kWmChar, 196, 0);
}

void DialPadView::PostNotification(const std::u16string& body, const std::u16string& sound) {
    if (context_.mainWindow)
        context_.mainWindow->Notifications().Post(kCmdNotificationTapped,
                                                  QString::fromStdU16String(body),
                                                  QString::fromStdU16String(sound));
}

void DialPadView::StartRingTone() {
    ring_.Start();
}

void DialPadView::StopRingTone() {
    ring_.Stop();
}

bool DialPadView::CompanionExists() {
    return ServerAnswers(WindowSocketPath(context_.runtimeRoot, kCompanionClass));
}

std::optional<long> DialPadView::SendCompanion(unsigned msg) {
    return SendWindowMessage(WindowSocketPath(context_.runtimeRoot, kCompanionClass), msg, 0, 0);
}

long DialPadView::SendToDialPad(unsigned msg, long wParam, long lParam) {
    return Messages().Send(this, msg, wParam, lParam);
}

void DialPadView::PostToDialPad(unsigned msg, long wParam, long lParam) {
    Messages().Post(this, msg, wParam, lParam);
}

void DialPadView::WaitWhileDelivering(const std::function<bool()>& done) {
    Messages().WaitWhileDelivering(done);
}

int DialFromAnywhere(ShellContext& context, const std::u16string& number) {
    if (!context.mainWindow) return 0;
    auto* pad = dynamic_cast<DialPadView*>(context.mainWindow->ViewAt(kViewDialPad));
    if (!pad) return 0;
    context.mainWindow->ShowDialPad();
    return pad->Dial(number);
}

}  // namespace vqm
