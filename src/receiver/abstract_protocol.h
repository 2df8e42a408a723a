// What the drivers of both families share: the connection they own, its lock, the abort switch, the
// way of progress upward, and the operations and steps that are the same in both. A driver speaks
// its family's commands only.
#ifndef RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_
#define RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_

#include <memory>
#include <string>
#include <vector>

#include "commands/file_entry.h"
#include "commands/receiver_cmd.h"
#include "platform/critical_section.h"
#include "platform/mutex.h"
#include "receiver/abort_switch.h"
#include "receiver/protocol.h"
#include "transport/connection.h"

class CAbstractProtocol : public CIProtocol {
 public:
  HRESULT CheckConnection(HANDLE abort_event, short* answer) override;
  // The operations that a family may not offer: E_NOTIMPL.
  HRESULT UploadFile(const CFileInfo* info, IStream* stream) override;
  HRESULT DeleteFile(const wchar_t* name) override;
  HRESULT RenameFile(const wchar_t* old_name, const wchar_t* new_name) override;
  HRESULT DCSetRcvBaudrate(DWORD baud_rate) override;
  HRESULT DCSetRcvRTSControl(BYTE rts) override;
  HRESULT DCSetRcvParity(BYTE parity) override;
  HRESULT DCSetRcvStopbits(BYTE stop_bits) override;

  void SetCallback(CIProtocolCallback* callback) override;
  void Abort() override;
  HRESULT LockConnection(HANDLE abort_event) override;
  HRESULT UnlockConnection() override;

 protected:
  // The speed of file transfers on a serial port, in bit/s.
  static constexpr DWORD kTransferSpeed = 115200;

  // `class_name` opens the driver's report lines and lives as long as the driver. Raises the
  // HRESULT of the Win32 error when a lock cannot be made.
  CAbstractProtocol(const wchar_t* class_name, std::unique_ptr<CIConnection> connection);

  CIConnection* connection() const { return connection_.get(); }

  // Executes a command as the current one, so that Abort reaches it.
  HRESULT ExecuteAsCurrent(CReceiverCmd& command);

  // Takes the abort, if one came, and raises S_FALSE.
  void ThrowIfAborted();

  // Raises the link from `speed` to kTransferSpeed, the receiver before the host. False: it could
  // not be raised, which is written to the report, and both ends are at the old speed. Raises
  // S_FALSE when an abort came before the receiver was told.
  bool RaiseSpeed(DWORD speed);

  // Hands a directory to the host's list, the last tenth of the progress. Raises E_OUTOFMEMORY.
  void AppendEntries(const std::vector<FileEntry>& entries, CFileList& files);

  // A progress report, at most 100.
  void ReportProgress(DWORD percent);

  AbortSwitch abort_;
  CriticalSection callback_lock_;  // guards callback_
  CIProtocolCallback* callback_ = nullptr;
  Mutex connection_lock_;  // held for a whole operation on the receiver

 private:
  // Whether a receiver of the family answers.
  virtual bool IsAnswering(HANDLE abort_event) = 0;
  // The receiver's half of RaiseSpeed. S_OK only when it was told and may have changed its speed.
  // A family whose files go at the speed that the link has need not override it.
  virtual HRESULT RaiseReceiver(DWORD) { return E_NOTIMPL; }
  // Undoes it, for a host that could not follow. No abort that came before disturbs it.
  virtual void SetReceiverBack(DWORD) {}

  const wchar_t* class_name_;
  std::unique_ptr<CIConnection> connection_;  // declared last, so that the link is closed first
};

// The name of a connection for the report, in the thread's ANSI code page; empty when it has none.
std::string NarrowNameOf(CIConnection* connection);
std::wstring NameOf(CIConnection* connection);

#endif  // RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_
