// The driver of Quorin receivers: each operation is a short sequence of Quorin commands over the
// connection that the driver owns.
#ifndef RCVLINK_QUORIN_QUORIN_PROTOCOL_H_
#define RCVLINK_QUORIN_QUORIN_PROTOCOL_H_

#include <memory>

#include "quorin/quorin_command.h"
#include "receiver/abstract_protocol.h"

namespace rcvlink {
class LinkPolicy;
}

class CQuorinProtocol : public CAbstractProtocol {
 public:
  explicit CQuorinProtocol(std::unique_ptr<CIConnection> connection);

  // Whether a Quorin receiver answers on the connection, whatever it was doing before. The abort
  // event (may be null) is tested between the steps and ends the wait for an answer, as Cancel
  // does.
  static bool Probe(CIConnection* connection, HANDLE abort_event);

  HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) override;
  HRESULT GetFiles(CFileList* files) override;
  HRESULT DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback* progress) override;
  HRESULT DeleteFile(const wchar_t* name) override;
  void SetCallback(CIProtocolCallback* callback) override;
  HRESULT DCSetRcvBaudrate(DWORD baud_rate) override;
  HRESULT DCSetRcvRTSControl(BYTE rts) override;
  HRESULT DCSetRcvParity(BYTE parity) override;
  HRESULT DCSetRcvStopbits(BYTE stop_bits) override;

  // Executes one command as the current one. Gives the failure that ended it, else the command's
  // Result().
  virtual HRESULT ExecuteCommand(QuorinCommands::CQuorinCommand& command);
  // The block transfer that follows a get command, into the stream. `size` is the file's size as
  // the receiver gave it (at least 1), for the progress. `block_length` is the payload of a block:
  // E_INVALIDARG for any other than kBlockPayload.
  virtual HRESULT DownloadOverSerial(IStream* stream, int size);
  virtual HRESULT DownloadOverUSB(IStream* stream, int size, DWORD block_length);

 private:
  bool IsAnswering(HANDLE abort_event) override { return Probe(connection(), abort_event); }

  // Asks for the receiver's port and sends it one setting. S_FALSE when the receiver names no port,
  // else the command's result. An abort that came before the setting was sent raises S_FALSE. It
  // takes no connection lock: that is the caller's task (rcvlink.h).
  template <typename MakeCommand>
  HRESULT ChangePort(MakeCommand make_command);
  HRESULT SendPortSetting(QuorinCommands::CQuorinCommand&& command);
  HRESULT ChangeSpeed(DWORD speed);

  void ReadIdentity(CReceiverInfo* info);

  // The parts of a download.
  HRESULT Transfer(const wchar_t* name, IStream* stream, EInstanceType link);
  HRESULT TakeBlocks(IStream* stream, int size, rcvlink::LinkPolicy& policy);
  void RestoreSpeed(DWORD saved_speed);
  HRESULT RaiseReceiver(DWORD speed) override { return ChangeSpeed(speed); }
  void SetReceiverBack(DWORD speed) override;

  DWORD download_read_timeout_ms_;
};

#endif  // RCVLINK_QUORIN_QUORIN_PROTOCOL_H_
