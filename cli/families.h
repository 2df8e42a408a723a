// What the program knows of each family of receivers.
#ifndef RCVLINK_CLI_FAMILIES_H_
#define RCVLINK_CLI_FAMILIES_H_

#include <windows.h>

#include <array>

#include "rcvlink.h"

namespace cli {

struct Family {
  EProtocol protocol;
  const char* name;  // in small letters it is the word of --protocol
  // The speeds to try first: the factory setting, and the one to which a download raises it.
  std::array<unsigned long, 2> usual_speeds;
  // What the family's port settings take for odd and even parity and for one stop bit; two stop
  // bits are one more.
  unsigned long odd;
  unsigned long even;
  unsigned long one_stop_bit;
  bool sets_rts;  // offers to control its RTS line
  bool rests;     // the library pauses for 500 ms after a reply
  // The command that most often has no line of its own in a report, and its text on the wire.
  const char* unnamed_command;
};

// A new family is one more entry.
inline constexpr std::array kFamilies = {
    Family{.protocol = eProtocolQuorin,
           .name = "Quorin",
           .usual_speeds = {CBR_115200, CBR_9600},
           .odd = 1,
           .even = 2,
           .one_stop_bit = 0,
           .sets_rts = true,
           .rests = false,
           .unnamed_command = "end an unfinished line"},
    Family{.protocol = eProtocolVelmar,
           .name = "Velmar",
           .usual_speeds = {CBR_9600, CBR_115200},
           .odd = 2,
           .even = 1,
           .one_stop_bit = 1,
           .sets_rts = false,
           .rests = true,
           .unnamed_command = "choose the file: currentfile NAME all"}};

// Null for a number that belongs to no family.
constexpr const Family* FindFamily(unsigned protocol) {
  for (const Family& family : kFamilies) {
    if (family.protocol == static_cast<EProtocol>(protocol)) return &family;
  }
  return nullptr;
}

}  // namespace cli

#endif  // RCVLINK_CLI_FAMILIES_H_
