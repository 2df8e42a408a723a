// The commands of the Velmar protocol (NovAtel's OEM commands and logs). Each is constructed,
// executed once over a connection, asked for its results and destroyed.
#ifndef RCVLINK_VELMAR_COMMANDS_H_
#define RCVLINK_VELMAR_COMMANDS_H_

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "commands/file_entry.h"
#include "velmar/logs.h"
#include "velmar/velmar_command.h"

namespace VelmarCommands {

// A command that waits for a log after the acknowledgement.
class CLogCommand : public CVelmarCommand {
 public:
  using CVelmarCommand::CVelmarCommand;
  HRESULT ParseReply(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;

 protected:
  // Sets response type, `done` and result from what a decoder of logs.h found.
  HRESULT Conclude(Progress progress, bool* done);
};

class CGetReceiverInfoCmd : public CLogCommand {
 public:
  CGetReceiverInfoCmd();
  HRESULT ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;
  const VersionLog& Version() const { return version_; }

 private:
  VersionLog version_;
};

class CGetFileListCmd : public CLogCommand {
 public:
  CGetFileListCmd();
  // Reads all logs of the reply so far, beginning with the first one each time.
  HRESULT ParseAsciiLog(const char* bytes,
                        uint32_t length,
                        bool* done,
                        uint32_t* consumed) override;
  FileEntries& Entries() { return entries_; }

 private:
  FileEntries entries_;
};

// The header of the current file.
class CGetFileHeaderCmd : public CLogCommand {
 public:
  CGetFileHeaderCmd();
  HRESULT ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;
  const FileHeaderLog& FileHeader() const { return file_header_; }

 private:
  FileHeaderLog file_header_;
};

// The settings of the port that the receiver uses for this link.
class CLogConfigCommand : public CLogCommand {
 public:
  CLogConfigCommand();
  HRESULT ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;
  const PortConfigLog& Config() const { return config_; }

 private:
  PortConfigLog config_;
};

// Called for each chunk of a file. The command owns the chunk and keeps it until the next one.
class CReadFileCmdCallback {
 public:
  // A failure ends the transfer.
  virtual HRESULT OnDataReceived(void* context) = 0;

 protected:
  ~CReadFileCmdCallback() = default;
};

// Transfers the current file.
class CReadFileCmd : public CLogCommand {
 public:
  CReadFileCmd(CReadFileCmdCallback* callback, void* context);
  HRESULT ParseReply(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;
  HRESULT ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;
  // Whether the receiver may have begun to send the file: it has answered, and not refused.
  bool HasBegun() const { return has_begun_; }
  const uint8_t* GetData() const;  // null before the first
  uint32_t GetDataSize() const { return static_cast<uint32_t>(chunk_.size()); }

 private:
  CReadFileCmdCallback* callback_;
  void* context_;
  bool has_begun_ = false;
  bool has_chunk_ = false;
  std::string chunk_;
};

// Makes a file the current one, which the commands for header and transfer then mean. A null name
// leaves no file current.
class CSetCurrentFileCmd : public CVelmarCommand {
 public:
  explicit CSetCurrentFileCmd(const char* name);
  HRESULT ParseReply(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override;
};

// Names are put into the commands unchanged, as the file list gave them.
class CDeleteFileCmd : public CVelmarCommand {
 public:
  explicit CDeleteFileCmd(const char* name);
};

class CRenameFileCmd : public CVelmarCommand {
 public:
  CRenameFileCmd(const char* old_name, const char* new_name);
};

// Sets the port that the receiver uses for this link: a command that names no port means that one,
// so `port` is not sent. Parity 1 even, 2 odd, else none; handshake 1 XON, 2 CTS, else none.
class CSetPortParamsCmd : public CVelmarCommand {
 public:
  CSetPortParamsCmd(const char* port,
                    uint32_t baud,
                    uint8_t parity,
                    uint8_t data_bits,
                    uint8_t stop_bits,
                    uint8_t handshake);
  explicit CSetPortParamsCmd(const PortConfigLog& settings);
};

// Makes the receiver use this protocol on the port, for commands and answers.
class CSetInterfacemodeCommand : public CVelmarCommand {
 public:
  CSetInterfacemodeCommand();
};

// Stops all logs on the port: they would stand before the next answer.
class CUnlogAllCommand : public CVelmarCommand {
 public:
  CUnlogAllCommand();
};

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_COMMANDS_H_
