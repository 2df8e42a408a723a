// The driver of Velmar receivers: each operation is a short sequence of Velmar commands over the
// connection that the driver owns.
#ifndef RCVLINK_VELMAR_VELMAR_PROTOCOL_H_
#define RCVLINK_VELMAR_VELMAR_PROTOCOL_H_

#include <memory>

#include "receiver/abstract_protocol.h"
#include "velmar/commands.h"

class CVelmarProtocol : public CAbstractProtocol, public VelmarCommands::CReadFileCmdCallback {
 public:
  explicit CVelmarProtocol(std::unique_ptr<CIConnection> connection);

  // Whether a Velmar receiver answers on the connection. The abort event (may be null) is looked at
  // between the steps and ends the wait for an answer.
  static bool Probe(CIConnection* connection, HANDLE abort_event);

  HRESULT CheckConnection(HANDLE abort_event, short* answer) override;
  HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) override;
  HRESULT GetFiles(CFileList* files) override;
  HRESULT DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback* progress) override;
  HRESULT DeleteFile(const wchar_t* name) override;
  HRESULT RenameFile(const wchar_t* old_name, const wchar_t* new_name) override;
  void SetCallback(CIProtocolCallback* callback) override;
  HRESULT DCSetRcvBaudrate(DWORD baud_rate) override;
  HRESULT DCSetRcvRTSControl(BYTE rts) override;
  HRESULT DCSetRcvParity(BYTE parity) override;
  HRESULT DCSetRcvStopbits(BYTE stop_bits) override;

  // Runs one command as the current one.
  virtual HRESULT ExecuteCommand(VelmarCommands::CVelmarCommand& command);

  HRESULT OnDataReceived(void* context) override;

 private:
  struct TransferContext;

  void ReadIdentity(HANDLE abort_event, CReceiverInfo* info);
  // The pattern of deleting and renaming: one command under the lock, whose answer is not looked
  // at.
  template <typename MakeCommand>
  HRESULT ChangeFile(MakeCommand make_command);

  // Reads the port's settings and sends them back with one of them changed. S_OK also when the
  // receiver did not say on which port it is.
  template <typename Change>
  HRESULT ChangePort(Change change);

  // The same for a download, which has to know what became of it: `*changed` tells whether the new
  // speed was sent and not refused (no answer counts as none). The question is cut off by an abort
  // (S_FALSE) or not, the change itself never is: it would leave the two ends at different speeds.
  enum class OnAbort { kEnd, kKeep };
  HRESULT ChangeReceiverSpeed(DWORD speed, OnAbort on_abort, bool* changed);
  // Runs a command that no abort reaches.
  HRESULT ExecuteUndisturbed(VelmarCommands::CVelmarCommand& command);

  // A download and its three parts.
  HRESULT DownloadLocked(const wchar_t* name, IStream* stream);
  DWORD RaiseSpeed();
  // `*is_sending` tells whether the receiver may still be sending the file.
  HRESULT Transfer(const wchar_t* name, IStream* stream, bool* is_sending);
  HRESULT RestoreSpeed(DWORD saved_speed, bool transfer_ended);

  void DropEarlierCancel();
  void ThrowIfAborted();
};

#endif  // RCVLINK_VELMAR_VELMAR_PROTOCOL_H_
