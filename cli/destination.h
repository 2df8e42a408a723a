// Where a download's bytes go.
#ifndef RCVLINK_CLI_DESTINATION_H_
#define RCVLINK_CLI_DESTINATION_H_

#include <windows.h>

#include <string>

#include "output.h"
#include "results.h"

namespace cli {

class Destination {
 public:
  Destination() = default;
  virtual ~Destination() = default;
  Destination(const Destination&) = delete;
  Destination& operator=(const Destination&) = delete;

  // Returns ERROR_SUCCESS, or the Win32 error.
  virtual DWORD Write(const void* data, DWORD size) = 0;

  // Called when all bytes are written.
  // Throws Failure.
  virtual void Complete() {}

  // Keeps the bytes that were written, although some may be missing.
  // Returns the path under which they are; empty when there is none.
  virtual std::wstring KeepIncomplete() { return {}; }

  // A failure of `Write`.
  virtual Failure FailureOf(DWORD error) const = 0;
};

// The standard output.
class ToOutput : public Destination {
 public:
  explicit ToOutput(Output& out) : out_(out) {}
  DWORD Write(const void* data, DWORD size) override {
    return out_.WriteRaw({static_cast<const char*>(data), size});
  }
  Failure FailureOf(DWORD error) const override {
    return {.exit = ExitCode::kLocalFile,
            .tried = "write to the standard output",
            .code = ResultOfWin32(error)};
  }

 private:
  Output& out_;
};

// Keeps nothing.
class Nowhere : public Destination {
 public:
  DWORD Write(const void* /*data*/, DWORD /*size*/) override { return ERROR_SUCCESS; }
  Failure FailureOf(DWORD error) const override {
    return {.exit = ExitCode::kLocalFile, .code = ResultOfWin32(error)};
  }
};

}  // namespace cli

#endif  // RCVLINK_CLI_DESTINATION_H_
