// What a block transfer does its own way over each kind of link.
#ifndef RCVLINK_QUORIN_LINK_POLICY_H_
#define RCVLINK_QUORIN_LINK_POLICY_H_

#include <cstdint>

#include "quorin/block.h"
#include "receiver/abort_switch.h"
#include "transport/connection.h"

class LinkPolicy {
 public:
  virtual ~LinkPolicy() = default;

  // Reads a new block at least so far that its header can be judged; a header that did not come
  // counts as one of an unknown type. Results as the connection's Read.
  virtual HRESULT ReadHeader(Block& block) = 0;
  // Reads what is left of the block. Anything but S_OK ends the transfer, or is a time-out.
  virtual HRESULT ReadRest(Block& block) = 0;

  // Whether the time-outs are counted anew for each block, or over the whole transfer.
  virtual bool CountsTimeoutsPerBlock() const = 0;
  // Whether the caller gets what the host's stream or an interrupted ACK gave; else S_OK, as the host
  // knows its own stream.
  virtual bool PassesResultsOn() const = 0;

  virtual uint8_t Percent(uint32_t delivered, uint32_t size) const = 0;
  // Whether a percent that has changed is told now; if not, it is not made up for.
  virtual bool IsTimeToTell() = 0;

  // What the report calls the transfer, and a time-out in it.
  virtual const wchar_t* Name() const = 0;
  virtual const wchar_t* TimeoutText() const = 0;
  // Whether the report says why a block was not taken.
  virtual bool TellsWhy() const = 0;
};

// A serial link is slow: the rest of a block whose header is wrong is not waited for.
class SerialPolicy : public LinkPolicy {
 public:
  explicit SerialPolicy(CIConnection* connection) : connection_(connection) {}

  HRESULT ReadHeader(Block& block) override;
  HRESULT ReadRest(Block& block) override;
  bool CountsTimeoutsPerBlock() const override { return true; }
  bool PassesResultsOn() const override { return false; }
  uint8_t Percent(uint32_t delivered, uint32_t size) const override;
  bool IsTimeToTell() override { return true; }
  const wchar_t* Name() const override { return L"DownloadOverSerial"; }
  const wchar_t* TimeoutText() const override { return L"read timeout"; }
  bool TellsWhy() const override { return false; }

 private:
  CIConnection* connection_;
};

// Over USB a block is read whole before it is judged.
class UsbPolicy : public LinkPolicy {
 public:
  // Made as the transfer starts.
  UsbPolicy(CIConnection* connection, AbortSwitch& abort, DWORD read_timeout_ms);

  HRESULT ReadHeader(Block& block) override;
  HRESULT ReadRest(Block& block) override;
  bool CountsTimeoutsPerBlock() const override { return false; }
  bool PassesResultsOn() const override { return true; }
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
  DWORD told_at_;               // when progress was told last, in ticks
};

#endif  // RCVLINK_QUORIN_LINK_POLICY_H_
