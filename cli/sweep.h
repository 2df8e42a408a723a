// The search for the setting at which the receiver on a serial port answers.
#ifndef RCVLINK_CLI_SWEEP_H_
#define RCVLINK_CLI_SWEEP_H_

#include <optional>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "settings.h"

namespace cli {

// A setting of this computer's port.
struct LineSetting {
  unsigned long speed = 0;  // bits per second; 0: what the port has
  RtsMode rts = RtsMode::kOn;

  friend bool operator==(const LineSetting&, const LineSetting&) = default;
};

// "57600 bit/s, RTS on"
std::string InWords(const LineSetting& line);

// A setting at which a receiver answered.
struct KnownSetting {
  LineSetting line{};
  EProtocol family = eProtocolQuorin;

  friend bool operator==(const KnownSetting&, const KnownSetting&) = default;
};

// One step of the search.
struct Try {
  LineSetting line{};
  std::vector<EProtocol> families{};  // to be asked in this order

  friend bool operator==(const Try&, const Try&) = default;
};

// The families that a value of --protocol stands for.
std::vector<EProtocol> FamiliesOf(EProtocol protocol);

// All tries, the most promising first: the known setting, the speeds that receivers usually have,
// that of the port, the rest. RTS always on works with nearly every cable, so it is tried before
// the other modes.
// `port_speed`: the speed that the port has; 0: not known
// `known`: where a receiver answered the last time on this port.
std::vector<Try> PlanSweep(EProtocol protocol,
                           unsigned long port_speed,
                           const std::optional<KnownSetting>& known);

// What a sweep does with its port.
class SweepPort {
 public:
  virtual ~SweepPort() = default;

  // Asks one family at one setting.
  // Returns as `devapi::CreateReceiverOnSerial`.
  virtual long Ask(const LineSetting& line, EProtocol family, void** receiver) = 0;

  // Called before each try.
  // `number`: counts from 1.
  virtual void Begin(size_t number, size_t count, const LineSetting& line) = 0;

  virtual bool IsCancelled() const = 0;
};

struct SweepResult {
  long code = 0;             // S_OK, S_FALSE when nobody answered, or why the port cannot be used
  void* receiver = nullptr;  // the library's handle, to be closed
  KnownSetting setting{};    // where the receiver answered
};

// Goes through the tries until a receiver answers, the port fails, or it is cancelled.
SweepResult RunSweep(const std::vector<Try>& tries, SweepPort& port);

}  // namespace cli

#endif  // RCVLINK_CLI_SWEEP_H_
