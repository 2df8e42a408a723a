// The only setting that a user can change: the registry value DownloadReadTimeout.
#ifndef RCVLINK_QUORIN_SETTINGS_H_
#define RCVLINK_QUORIN_SETTINGS_H_

#include "platform/win32.h"

namespace rcvlink {

// How long a download over USB waits for each read, in milliseconds: the value DownloadReadTimeout
// (REG_DWORD) of the current user's key Software\Quorin\QuorinDeviceMgr\QuorinProtocol, or 30000.
DWORD ReadDownloadReadTimeout();

}  // namespace rcvlink

#endif  // RCVLINK_QUORIN_SETTINGS_H_
