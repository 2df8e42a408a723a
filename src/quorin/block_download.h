// The block transfer of a Quorin download (block.h): takes block after block into the host's stream
// and answers each.
#ifndef RCVLINK_QUORIN_BLOCK_DOWNLOAD_H_
#define RCVLINK_QUORIN_BLOCK_DOWNLOAD_H_

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>

#include "quorin/block.h"
#include "quorin/link_policy.h"
#include "receiver/abort_switch.h"
#include "transport/connection.h"

#include <objidl.h>

// Writes one of the control bytes. No abort cuts it off: the host would not know whether the
// receiver has heard it.
HRESULT WriteControl(CIConnection* connection, uint8_t control);

class BlockDownload {
 public:
  using ProgressFunction = std::function<void(uint8_t percent)>;

  // `size` is what the receiver said, and serves the progress only.
  BlockDownload(CIConnection* connection,
                AbortSwitch& abort,
                ProgressFunction tell_progress,
                IStream* stream,
                int size,
                LinkPolicy& policy);

  // Runs the transfer, whose first block has been asked for. S_OK: the stream has the file; S_FALSE:
  // aborted, or ended by the receiver; E_INVALIDARG: no stream, or a size below 1; kTimedOut;
  // kNotConnected: a last block of an impossible length; else what ended it.
  HRESULT Run();

 private:
  // The steps of a round; a result ends the transfer.
  std::optional<HRESULT> TakeBlock();
  std::optional<HRESULT> Accept(const Block& block, size_t payload_length);
  void TellProgress();
  std::optional<HRESULT> AfterFailedRead(HRESULT failure);
  std::optional<HRESULT> AskAgain();
  std::optional<HRESULT> AskAgain(const wchar_t* why);

  HRESULT EndCancelled();
  HRESULT EndTransfer();
  HRESULT Passed(HRESULT result) const;
  void TraceText(const wchar_t* text) const;
  void TraceWhy(const wchar_t* text) const;

  CIConnection* connection_;
  AbortSwitch& abort_;
  ProgressFunction tell_progress_;
  IStream* stream_;
  int size_;
  LinkPolicy& policy_;

  uint16_t crc_ = 0;  // of the blocks accepted so far
  uint32_t expected_sequence_ = 0;
  uint32_t delivered_ = 0;
  uint8_t percent_ = 0;  // the last that was counted
  int timeouts_ = 0;
};

#endif  // RCVLINK_QUORIN_BLOCK_DOWNLOAD_H_
