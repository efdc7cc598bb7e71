// The program's icons, drawn here rather than shipped as image files: the window icon (101),
// the tray icons for card connected (107) and not connected (108), and the menu bar's view
// buttons (bitmap 113, images 0 to 6 in view-table order).
#pragma once

#include <QIcon>

namespace vqm {

QIcon ProgramIcon(int id);
QIcon ViewButtonIcon(int index);

}  // namespace vqm
