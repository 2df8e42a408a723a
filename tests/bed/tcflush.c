// Preloaded into the programs under Wine, so that a pseudo-terminal does not lose bytes that a serial
// port would have sent.
//
// PurgeComm(PURGE_TXCLEAR) discards what has not been sent yet. On a serial port nothing is left after
// a completed write. On a pseudo-terminal everything is left that the other side has not read yet, so a
// command would be lost whenever the simulated receiver was late.
#include <sys/ioctl.h>
#include <termios.h>

int tcflush(int fd, int queue) {
  if (queue == TCOFLUSH) {
    struct termios settings;
    return tcgetattr(fd, &settings);
  }
  return ioctl(fd, TCFLSH, queue == TCIOFLUSH ? TCIFLUSH : queue);
}
