// Preloaded into the programs under Wine, so that a pseudo-terminal forgets as little as a port.
//
// PurgeComm(PURGE_TXCLEAR) throws away what has not been sent yet. On a port that is nothing once the
// write has completed; on a pseudo-terminal it is everything the other side has not read yet, so that
// a command could be lost whenever the receiver's process was late.
#include <sys/ioctl.h>
#include <termios.h>

int tcflush(int fd, int queue) {
  if (queue == TCOFLUSH) {
    struct termios settings;
    return tcgetattr(fd, &settings);
  }
  return ioctl(fd, TCFLSH, queue == TCIOFLUSH ? TCIFLUSH : queue);
}
