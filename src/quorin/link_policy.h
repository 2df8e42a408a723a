// The differences between a block transfer over a serial line and one over USB.
#ifndef RCVLINK_QUORIN_LINK_POLICY_H_
#define RCVLINK_QUORIN_LINK_POLICY_H_

#include <cstdint>

#include "quorin/block.h"
#include "receiver/abort_switch.h"
#include "transport/connection.h"

namespace rcvlink {

class LinkPolicy {
 public:
  virtual ~LinkPolicy() = default;

  // Reads at least the header of the next block. A header that did not come whole counts as one of
  // an unknown type, so that the block is asked for again. Results as those of the connection's
  // Read.
  virtual HRESULT ReadHeader(Block& block) = 0;
  // Reads the rest of the block. A time-out asks for the block again; any other result but S_OK
  // ends the transfer.
  virtual HRESULT ReadRest(Block& block) = 0;

  // Whether the time-outs are counted for each block, or over the whole transfer. Over USB a read
  // waits ten times as long, so a silent receiver would keep the host too long if each block had
  // its own count.
  virtual bool CountsTimeoutsPerBlock() const = 0;
  // Whether the result of the host's stream, or of an ACK that was cut off, is given to the host.
  // Over a serial line it is S_OK instead. Hosts rely on either: over a serial line they ask their
  // stream what it has written, over USB they look at the result.
  virtual bool PassesResultsOn() const = 0;

  // How long blocks may be refused, one after the other, before the transfer ends; INFINITE for
  // ever. A host ends a transfer over a serial line when it has waited long enough: on a bad line a
  // block may need many tries. A USB link has no noise: a receiver whose blocks are refused for so
  // long does not send the file.
  virtual DWORD LongestWithoutBlockMs() const = 0;

  virtual uint8_t Percent(uint32_t delivered, uint32_t size) const = 0;
  // Whether a percent that has changed is reported now; if not, it is left out.
  virtual bool IsTimeToTell() = 0;

  // What the report calls the transfer, and a time-out in it.
  virtual const wchar_t* Name() const = 0;
  virtual const wchar_t* TimeoutText() const = 0;
  // Whether the report says why a block was not accepted. On a serial line with much noise the
  // lines would fill it.
  virtual bool TellsWhy() const = 0;
};

// A serial line is slow: the rest of a block whose header is wrong is not waited for.
class SerialPolicy : public LinkPolicy {
 public:
  explicit SerialPolicy(CIConnection* connection) : connection_(connection) {}

  HRESULT ReadHeader(Block& block) override;
  HRESULT ReadRest(Block& block) override;
  bool CountsTimeoutsPerBlock() const override { return true; }
  bool PassesResultsOn() const override { return false; }
  DWORD LongestWithoutBlockMs() const override { return INFINITE; }
  uint8_t Percent(uint32_t delivered, uint32_t size) const override;
  bool IsTimeToTell() override { return true; }
  const wchar_t* Name() const override { return L"DownloadOverSerial"; }
  const wchar_t* TimeoutText() const override { return L"read timeout"; }
  bool TellsWhy() const override { return false; }

 private:
  CIConnection* connection_;
};

// Over USB data comes in packets, so a block is read whole before its header is tested.
class UsbPolicy : public LinkPolicy {
 public:
  // Constructed as the transfer starts: the first progress report comes half a second later.
  UsbPolicy(CIConnection* connection, AbortSwitch& abort, DWORD read_timeout_ms);

  HRESULT ReadHeader(Block& block) override;
  HRESULT ReadRest(Block& block) override;
  bool CountsTimeoutsPerBlock() const override { return false; }
  bool PassesResultsOn() const override { return true; }
  DWORD LongestWithoutBlockMs() const override;
  uint8_t Percent(uint32_t delivered, uint32_t size) const override;
  bool IsTimeToTell() override;
  const wchar_t* Name() const override { return L"DownloadOverUSB"; }
  const wchar_t* TimeoutText() const override { return L"read timeout."; }
  bool TellsWhy() const override { return true; }

 private:
  HRESULT ReadWhole(Block& block);

  CIConnection* connection_;
  AbortSwitch& abort_;
  DWORD read_timeout_ms_;
  HRESULT read_result_ = S_OK;  // of the current block
  DWORD told_at_;               // when progress was reported last, in ticks of the clock
};

}  // namespace rcvlink

#endif  // RCVLINK_QUORIN_LINK_POLICY_H_
