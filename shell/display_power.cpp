#include "shell/display_power.h"

// Qt first: the X11 headers define macros (None, Bool, Status) that Qt's headers use as names.
#include <QtGui/qguiapplication_platform.h>
#include <QGuiApplication>

#include <X11/Xlib.h>
#include <X11/extensions/dpms.h>

namespace vqm {

namespace {

Display* X11Display() {
    if (QGuiApplication::platformName() != QLatin1String("xcb")) return nullptr;
    auto* x11 = qGuiApp->nativeInterface<QNativeInterface::QX11Application>();
    return x11 ? x11->display() : nullptr;
}

bool Capable(Display* display) {
    int event = 0, error = 0;
    return display && DPMSQueryExtension(display, &event, &error) && DPMSCapable(display);
}

}  // namespace

int DisplayPower::DisplayPowerQuery() {
    return Capable(X11Display()) ? 1 : 0;
}

void DisplayPower::DisplayOn() {
    Display* display = X11Display();
    if (!Capable(display)) return;
    DPMSEnable(display);
    DPMSForceLevel(display, DPMSModeOn);
    XFlush(display);
}

void DisplayPower::DisplayOff() {
    Display* display = X11Display();
    if (!Capable(display)) return;
    DPMSEnable(display);
    DPMSForceLevel(display, DPMSModeOff);
    XFlush(display);
}

}  // namespace vqm
