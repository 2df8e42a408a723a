// What the drivers of both families share: the connection they own, its lock, the command that is
// running, the abort, and the way of progress upward. A driver speaks its family's commands only.
#ifndef RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_
#define RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_

#include <memory>
#include <string>
#include <vector>

#include "commands/file_entry.h"
#include "commands/receiver_cmd.h"
#include "platform/critical_section.h"
#include "platform/mutex.h"
#include "receiver/protocol.h"
#include "transport/connection.h"

class CAbstractProtocol : public CIProtocol {
 public:
  HRESULT UploadFile(const CFileInfo* info, IStream* stream) override;
  void Abort() override;
  HRESULT LockConnection(HANDLE abort_event) override;
  HRESULT UnlockConnection() override;

 protected:
  // `class_name` opens the driver's report lines and lives as long as the driver. Raises the
  // HRESULT of the Win32 error when a lock cannot be made.
  CAbstractProtocol(const wchar_t* class_name, std::unique_ptr<CIConnection> connection);

  CIConnection* connection() const { return connection_.get(); }

  // Executes a command as the current one, so that Abort reaches it.
  HRESULT ExecuteAsCurrent(CReceiverCmd& command);

  // Whether an abort came; finding it forgets it, so one abort ends one operation.
  bool TakeAbort();

  // Before commands are sent: takes the cancel of an abort that was found already, if it ended no
  // wait, or it would end the first wait of what follows. ExecuteAsCurrent does this by itself.
  void UseUpCancel();

  // Whether an abort came that nobody has taken yet.
  bool IsAborted();
  // Takes a cancel that ended no wait, also that of an abort which nobody has taken yet.
  void DropCancel();

  // Hands a directory to the host's list, the last tenth of the progress. Raises E_OUTOFMEMORY.
  void AppendEntries(const std::vector<FileEntry>& entries, CFileList& files);

  // A progress report, at most 100.
  void ReportProgress(DWORD percent);

  CriticalSection callback_lock_;  // guards callback_
  CIProtocolCallback* callback_ = nullptr;
  Mutex connection_lock_;  // held for a whole operation on the receiver

 private:
  void SetCurrentCommand(CReceiverCmd* command);

  const wchar_t* class_name_;
  CriticalSection command_lock_;  // guards the three below
  bool abort_ = false;
  bool cancel_left_over_ = false;  // an abort was found; its cancel may still be there
  CReceiverCmd* current_command_ = nullptr;
  std::unique_ptr<CIConnection> connection_;  // last, so that the link goes first
};

// The name of a connection for the report, in the thread's ANSI code page; empty when it has none.
std::string NarrowNameOf(CIConnection* connection);
std::wstring NameOf(CIConnection* connection);

#endif  // RCVLINK_RECEIVER_ABSTRACT_PROTOCOL_H_
