// The base of all drivers: the connection that a driver owns, its lock, the abort switch, progress,
// and the operations and steps that are the same in every family.
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
  // Not every family offers these operations: E_NOTIMPL unless a driver overrides them.
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
  // The speed to which a serial link is raised for the transfer of a file, in bit/s. It is the
  // highest that discovery tries, so that a receiver that keeps it is found again.
  static constexpr DWORD kTransferSpeed = 115200;

  // `class_name` stands at the beginning of the driver's lines of the report; it must stay valid as
  // long as the driver. Raises the HRESULT of the Win32 error when a lock cannot be created.
  CAbstractProtocol(const wchar_t* class_name, std::unique_ptr<CIConnection> connection);

  CIConnection* connection() const { return connection_.get(); }

  // Executes a command as the current one, which Abort marks.
  HRESULT ExecuteAsCurrent(CReceiverCmd& command);

  // Ends the operation by raising S_FALSE when an abort came, and clears the abort.
  void ThrowIfAborted();

  // Raises the link from `speed` to kTransferSpeed: first the receiver, which still hears the
  // command at the old speed, then the host's port. False: it could not be raised, which is written
  // to the report, and both ends are at the old speed. Raises S_FALSE when an abort came before the
  // command was sent.
  bool RaiseSpeed(DWORD speed);

  // Copies a directory into the host's list and reports the last tenth of the progress. Raises
  // E_OUTOFMEMORY.
  void AppendEntries(const FileEntries& entries, CFileList& files);

  // Reports progress; a higher percent counts as 100.
  void ReportProgress(DWORD percent);

  rcvlink::AbortSwitch abort_;
  rcvlink::CriticalSection callback_lock_;  // guards callback_
  CIProtocolCallback* callback_ = nullptr;
  rcvlink::Mutex connection_lock_;  // held for a whole operation on the receiver

 private:
  // Whether a receiver of the family answers.
  virtual bool IsAnswering(HANDLE abort_event) = 0;
  // Sets the receiver to the speed. S_OK only when the command was sent and the receiver may have
  // changed its speed. A family that transfers files at the speed of the link does not override it.
  virtual HRESULT RaiseReceiver(DWORD) { return E_NOTIMPL; }
  // Sets the receiver back to the speed, when the host's port cannot change to the new one. An
  // abort that came before does not end it: the link would stay cut.
  virtual void SetReceiverBack(DWORD) {}

  const wchar_t* class_name_;
  std::unique_ptr<CIConnection> connection_;  // declared last, destroyed first: it closes the link
};

namespace rcvlink {

// The name of a connection for the report, in the thread's ANSI code page; empty when it has none.
std::string NarrowNameOf(CIConnection* connection);
std::wstring NameOf(CIConnection* connection);

}  // namespace rcvlink

#endif  // RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_
