// A download's file on this computer.
#ifndef RCVLINK_CLI_PART_FILE_H_
#define RCVLINK_CLI_PART_FILE_H_

#include <filesystem>
#include <functional>

#include "destination.h"
#include "handle.h"

namespace cli {

// A file with the name of its target and ".part" after it. It is deleted unless it is kept, even
// when the process is killed.
class PartFile : public Destination {
 public:
  // Looks at the complete file before it gets its name.
  // Throws Failure when it may not have it.
  using Test = std::function<void(const std::filesystem::path& part)>;

  struct Overwrite {
    bool part = false;
    bool target = false;
  };

  // `overwrite`: which files may be replaced
  // `test`: may be empty
  // Throws Failure when it cannot be made.
  PartFile(std::filesystem::path target, Overwrite overwrite, Test test = {});
  ~PartFile() override;

  DWORD Write(const void* data, DWORD size) override;

  // Gives the file its name.
  // Throws Failure when that does not work; all bytes are then in the file with ".part".
  void Complete() override;

  std::wstring KeepIncomplete() override;
  Failure FailureOf(DWORD error) const override;

 private:
  bool SetVanishing(bool vanishing);
  Failure KeptFailure(Failure failure) const;

  std::filesystem::path target_;
  std::filesystem::path part_;
  Overwrite overwrite_;
  Test test_;
  bool kept_ = false;
  UniqueHandle file_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_PART_FILE_H_
