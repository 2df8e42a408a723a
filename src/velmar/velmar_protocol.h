// The driver of Velmar receivers: each operation is a short sequence of Velmar commands over the
// connection that the driver owns.
#ifndef RCVLINK_VELMAR_VELMAR_PROTOCOL_H_
#define RCVLINK_VELMAR_VELMAR_PROTOCOL_H_

#include <memory>
#include <optional>

#include "receiver/abstract_protocol.h"
#include "velmar/commands.h"

class CVelmarProtocol : public CAbstractProtocol, public VelmarCommands::CReadFileCmdCallback {
 public:
  explicit CVelmarProtocol(std::unique_ptr<CIConnection> connection);

  // Whether a Velmar receiver answers on the connection. The abort event (may be null) is tested
  // between the steps and ends the wait for an answer, as Cancel does.
  static bool Probe(CIConnection* connection, HANDLE abort_event);

  HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) override;
  HRESULT GetFiles(CFileList* files) override;
  HRESULT DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback* progress) override;
  HRESULT DeleteFile(const wchar_t* name) override;
  HRESULT RenameFile(const wchar_t* old_name, const wchar_t* new_name) override;
  HRESULT DCSetRcvBaudrate(DWORD baud_rate) override;
  HRESULT DCSetRcvParity(BYTE parity) override;
  HRESULT DCSetRcvStopbits(BYTE stop_bits) override;

  // Executes one command as the current one.
  virtual HRESULT ExecuteCommand(VelmarCommands::CVelmarCommand& command);

  // The context is the FileDownload that is running.
  HRESULT OnDataReceived(void* context) override;

 private:
  bool IsAnswering(HANDLE abort_event) override;

  // Executes a command whose line is always sent: an abort ends only the wait for the answer.
  HRESULT ExecuteForCertain(VelmarCommands::CVelmarCommand& command);

  // What follows each command: notes when an abort ended it, and writes a failure to the report.
  HRESULT Conclude(HRESULT result, const VelmarCommands::CVelmarCommand& command);

  // After an abort has ended a command's wait: waits for as long as a late answer may take. Answers
  // do not say to which command they belong, so the next command would take it for its own.
  void AwaitLateAnswer();
  void NoteCutOff();

  void ReadIdentity(HANDLE abort_event, CReceiverInfo* info);
  // Deletes or renames: executes one command under the lock, and does not evaluate its answer.
  template <typename MakeCommand>
  HRESULT ChangeFile(MakeCommand make_command);

  // Reads the port's settings and sends them back with one of them changed: the command sets all of
  // them at once. S_OK also when the receiver did not name its port; nothing is sent then.
  template <typename Change>
  HRESULT ChangePort(Change change);

  // A download and its parts.
  HRESULT DownloadLocked(const wchar_t* name, IStream* stream);
  // Sets `*is_sending` when the receiver may still be sending the file.
  HRESULT Transfer(const wchar_t* name, IStream* stream, bool* is_sending);
  HRESULT RaiseReceiver(DWORD speed) override;
  void SetReceiverBack(DWORD speed) override;
  HRESULT RestoreSpeed(DWORD speed, bool is_aborted);
  HRESULT TellSpeed(DWORD speed, bool is_aborted);

  std::optional<DWORD> cut_off_at_;  // when a command's wait was ended by an abort, in ticks
  VelmarCommands::PortConfigLog raised_port_;  // the receiver's port before its speed was raised
};

#endif  // RCVLINK_VELMAR_VELMAR_PROTOCOL_H_
