// Standard output and standard error, in UTF-8 whatever they are.
#ifndef RCVLINK_CLI_OUTPUT_H_
#define RCVLINK_CLI_OUTPUT_H_

#include <windows.h>

#include <string_view>

namespace cli {

// One of the process's two output handles, which the process owns. Used by one thread at a time.
class Output {
 public:
  // `stream`: STD_OUTPUT_HANDLE or STD_ERROR_HANDLE.
  explicit Output(DWORD stream);

  bool is_terminal() const { return is_terminal_; }

  // Width of the terminal in characters; a default when it is not known.
  size_t Width() const;

  void Write(std::string_view utf8);

  // Bytes as they are, also on a terminal.
  // Returns ERROR_SUCCESS, or the Win32 error.
  DWORD WriteRaw(std::string_view bytes);

  // Win32 error of the first write that failed; 0 for none.
  DWORD first_error() const { return first_error_; }

  // Whether the reader has closed its end, as `more` and `head` do. The error depends on the kind
  // of pipe, and Wine has a third one.
  bool IsClosed() const {
    return first_error_ == ERROR_BROKEN_PIPE || first_error_ == ERROR_NO_DATA ||
           first_error_ == ERROR_PIPE_NOT_CONNECTED;
  }

 private:
  void WriteBytes(std::string_view bytes);

  HANDLE handle_;
  bool is_terminal_;
  DWORD first_error_ = ERROR_SUCCESS;
};

}  // namespace cli

#endif  // RCVLINK_CLI_OUTPUT_H_
