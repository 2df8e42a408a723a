// The block transfer of a Quorin download: writes each block (block.h) to the host's stream and
// answers it.
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

namespace rcvlink {

// Writes one of the control bytes. No abort ends the write: the host would not know whether the
// receiver has got the byte.
HRESULT WriteControl(CIConnection* connection, uint8_t control);

class BlockDownload {
 public:
  using ProgressFunction = std::function<void(uint8_t percent)>;

  // `size` is the file's size as the receiver gave it. It is used for the progress only: a file
  // that is still being recorded may have grown, and the last block marks its end.
  BlockDownload(CIConnection* connection,
                AbortSwitch& abort,
                ProgressFunction tell_progress,
                IStream* stream,
                int size,
                LinkPolicy& policy);

  // Runs the transfer, after the caller has asked for the first block. S_OK: the transfer ended
  // (over a serial line also when the stream failed); S_FALSE: aborted, or ended by the receiver;
  // E_INVALIDARG: no stream, or a size below 1; kTimedOut: no block came, or none that could be
  // accepted; kNotConnected: a last block of an invalid length; else the failure of the connection,
  // or over USB that of the stream.
  HRESULT Run();

 private:
  // The steps for one block. A result ends the transfer.
  std::optional<HRESULT> TakeBlock();
  std::optional<HRESULT> Accept(const Block& block, size_t payload_length);
  void TellProgress();
  std::optional<HRESULT> AfterFailedRead(HRESULT failure);
  std::optional<HRESULT> AskAgain();
  std::optional<HRESULT> AskAgain(const wchar_t* why);
  bool IsHopeless() const;

  HRESULT EndCancelled();
  HRESULT EndTransfer();
  // The result, or S_OK over a link whose host does not get it (LinkPolicy).
  HRESULT Passed(HRESULT result) const;
  void TraceText(const wchar_t* text) const;
  void TraceWhy(const wchar_t* text) const;

  CIConnection* connection_;
  AbortSwitch& abort_;
  ProgressFunction tell_progress_;
  IStream* stream_;
  int size_;
  LinkPolicy& policy_;

  uint16_t crc_ = 0;  // of all blocks accepted so far
  uint32_t expected_sequence_ = 0;
  uint32_t delivered_ = 0;
  uint8_t percent_ = 0;  // the last that was computed, also when it was not reported
  int timeouts_ = 0;
  DWORD accepted_at_ = 0;  // when the last block was, or the transfer began; in ticks of the clock
};

}  // namespace rcvlink

#endif  // RCVLINK_QUORIN_BLOCK_DOWNLOAD_H_
