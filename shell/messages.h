// Message numbers shared by the main window, the views, the worker threads and the card
// manager. Their values are fixed: other programs of the family use the same numbers.
#pragma once

namespace vqm {

// Window messages of the platform the views were written for.
inline constexpr unsigned kWmCreate = 1;
inline constexpr unsigned kWmDestroy = 2;
inline constexpr unsigned kWmActivate = 6;
inline constexpr unsigned kWmPaint = 15;
inline constexpr unsigned kWmChar = 258;
inline constexpr unsigned kWmCommand = 273;
inline constexpr unsigned kWmTimer = 275;
inline constexpr unsigned kWmLButtonDown = 513;
inline constexpr long kWaInactive = 0;

// Private messages.
inline constexpr unsigned kMsgViewShown = 2025;
inline constexpr unsigned kMsgCardStateChanged = 2026;
inline constexpr unsigned kMsgTrayIcon = 2027;
inline constexpr unsigned kMsgRefreshLists = 2032;
inline constexpr unsigned kMsgDialResult = 2125;
inline constexpr unsigned kMsgOutlookCacheBuilt = 1124;
inline constexpr unsigned kMsgSimCacheBuilt = 1224;
inline constexpr unsigned kMsgSimRefreshDone = 1324;
// A second dialer asks the first to come forward (what a foreground request did before).
inline constexpr unsigned kMsgBringForward = 0x8001;

// Command ids (WM_COMMAND).
inline constexpr int kCmdViewFirst = 40001;  // 40001..40006 views 0..5
inline constexpr int kCmdOffDisplay = 40014;
inline constexpr int kCmdExit = 40016;
inline constexpr int kCmdAbout = 40018;
inline constexpr int kCmdWhatsThis = 40029;
inline constexpr int kCmdNotificationTapped = 2002;

inline constexpr int kTimerCardWatch = 1000;
inline constexpr int kTrayIconId = 10;
inline constexpr int kIconConnected = 107;
inline constexpr int kIconNotConnected = 108;
inline constexpr int kMenuBarHeight = 26;

// Message box styles and answers.
inline constexpr unsigned kMbOk = 0x0;
inline constexpr unsigned kMbOkCancel = 0x1;
inline constexpr unsigned kMbIconQuestion = 0x20;
inline constexpr unsigned kMbIconExclamation = 0x30;
inline constexpr unsigned kMbIconInformation = 0x40;
inline constexpr unsigned kMbTopmost = 0x40000;
inline constexpr int kIdOk = 1;
inline constexpr int kIdCancel = 2;

inline constexpr char kMainWindowClass[] = "DIALERAPP_CLASS";
inline constexpr char16_t kMainWindowTitle[] = u"VQM Dialer v 2.01";
inline constexpr char16_t kBoxTitle[] = u"VQM Dialer";

}  // namespace vqm
