// Switching the display off and on, through X11 DPMS where the display has it. Elsewhere
// (Wayland, VNC, offscreen) the display power is reported unsupported.
#pragma once

namespace vqm {

class DisplayPower {
  public:
    // 1 when the display can be switched off and on.
    int DisplayPowerQuery();
    void DisplayOn();
    void DisplayOff();
};

}  // namespace vqm
