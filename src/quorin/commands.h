// The commands of the Quorin protocol. Each is constructed, executed once over a connection, asked
// for its results and destroyed. A port index is the number of a serial port of the receiver: 0 is
// port a.
//
// Commands that ignore `flags` do not wait for a reply: receivers do not answer them.
#ifndef RCVLINK_QUORIN_COMMANDS_H_
#define RCVLINK_QUORIN_COMMANDS_H_

#include <cstdint>
#include <string>
#include <vector>

#include "commands/file_entry.h"
#include "quorin/quorin_command.h"

namespace QuorinCommands {

// "#OFF#": stops the receiver's echo. It needs no port, so it can be sent before the port is known.
class CEchoOffCmd : public CQuorinCommand {
 public:
  explicit CEchoOffCmd(uint32_t flags);
};

class CDisableEchoCmd : public CQuorinCommand {
 public:
  CDisableEchoCmd(int port_index, uint32_t flags);
};

// An empty line: the proof that a receiver of this family answers, with an "RE" message.
class CPingCmd : public CQuorinCommand {
 public:
  explicit CPingCmd(uint32_t flags);
  HRESULT ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done) override;
};

// Asks which of its ports the receiver uses for this link.
class CGetPortCmd : public CQuorinCommand {
 public:
  explicit CGetPortCmd(uint32_t flags);
  int PortIndex() const;  // -1 when the reply names no port
};

class CChangeBaudRateCmd : public CQuorinCommand {
 public:
  CChangeBaudRateCmd(int port_index, uint32_t rate, uint32_t flags);
};

// Parity 1 odd, 2 even, any other value none.
class CChangeParityCmd : public CQuorinCommand {
 public:
  CChangeParityCmd(int port_index, uint8_t parity, uint32_t flags);
};

class CChangeRTSSignalCmd : public CQuorinCommand {
 public:
  CChangeRTSSignalCmd(int port_index, bool on, uint32_t flags);
};

class CChangeStopbitsCmd : public CQuorinCommand {
 public:
  CChangeStopbitsCmd(int port_index, bool two, uint32_t flags);
};

class CGetFileListCmd : public CQuorinCommand {
 public:
  explicit CGetFileListCmd(uint32_t flags);
  // One message holds one entry; the last one sets `done`.
  HRESULT ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done) override;
  const FileEntries& Entries() const { return entries_; }

 private:
  bool Append(FileEntry entry);

  FileEntries entries_;
};

// Names are put into the commands unchanged, as the file list gave them.
class CDeleteFileCmd : public CQuorinCommand {
 public:
  CDeleteFileCmd(const std::string& name, uint32_t flags);
};

// Starts a block transfer.
class CGetFileCmd : public CQuorinCommand {
 public:
  CGetFileCmd(const std::string& name, uint32_t block_length, uint32_t flags);
};

class CGetFileSizeCmd : public CQuorinCommand {
 public:
  CGetFileSizeCmd(const std::string& name, uint32_t flags);
  int Size() const;  // bytes; 0 when the receiver did not give it
};

class CGetReceiverIDCmd : public CQuorinCommand {
 public:
  explicit CGetReceiverIDCmd(uint32_t flags);
  std::wstring Text() const;  // without white space at the beginning
};

class CGetReceiverModelCmd : public CQuorinCommand {
 public:
  explicit CGetReceiverModelCmd(uint32_t flags);
  std::wstring Text() const;
};

// Sets the speed of the port that the receiver uses for this link, and waits for the answer, which
// still comes at the old speed. The class's misspelt name stands in a line of the report, for which
// people search.
class CSetBoudRateCmd : public CQuorinCommand {
 public:
  CSetBoudRateCmd(uint32_t rate, uint32_t flags);
};

}  // namespace QuorinCommands

#endif  // RCVLINK_QUORIN_COMMANDS_H_
