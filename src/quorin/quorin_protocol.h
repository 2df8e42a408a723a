// The driver of Quorin receivers: each operation is a short sequence of Quorin commands over the
// connection that the driver owns.
#ifndef RCVLINK_QUORIN_QUORIN_PROTOCOL_H_
#define RCVLINK_QUORIN_QUORIN_PROTOCOL_H_

#include <memory>

#include "quorin/quorin_command.h"
#include "receiver/abstract_protocol.h"

class LinkPolicy;

class CQuorinProtocol : public CAbstractProtocol {
 public:
  explicit CQuorinProtocol(std::unique_ptr<CIConnection> connection);

  // Whether a Quorin receiver, in whatever state, answers on the connection. The abort event (may
  // be null) is looked at between the steps and ends the wait for an answer, as Cancel does.
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

  // Runs one command as the current one. The failure that ended it, else the command's own result.
  virtual HRESULT ExecuteCommand(QuorinCommands::CQuorinCommand& command);
  // The block transfer that follows a get command, into the stream. `size` is what the receiver
  // said (at least 1) and serves the progress only. `block_length` is the payload of a block; no
  // other than kBlockPayload is in use.
  virtual HRESULT DownloadOverSerial(IStream* stream, int size);
  virtual HRESULT DownloadOverUSB(IStream* stream, int size, DWORD block_length);

 private:
  bool IsAnswering(HANDLE abort_event) override { return Probe(connection(), abort_event); }

  // Asks for the receiver's port and sends it one setting. S_FALSE when it names none, or the
  // command's failure. An abort that came before the setting was sent raises S_FALSE.
  template <typename MakeCommand>
  HRESULT ChangePort(MakeCommand make_command);
  HRESULT SendPortSetting(QuorinCommands::CQuorinCommand&& command);
  HRESULT ChangeSpeed(DWORD speed);

  void ReadIdentity(CReceiverInfo* info);

  // The parts of a download.
  HRESULT Transfer(const wchar_t* name, IStream* stream, EInstanceType link);
  HRESULT TakeBlocks(IStream* stream, int size, LinkPolicy& policy);
  void RestoreSpeed(DWORD saved_speed);
  HRESULT RaiseReceiver(DWORD speed) override { return ChangeSpeed(speed); }
  void SetReceiverBack(DWORD speed) override;

  DWORD download_read_timeout_ms_;
};

#endif  // RCVLINK_QUORIN_QUORIN_PROTOCOL_H_
