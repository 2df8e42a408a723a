// One file from the receiver to the disk.
#ifndef RCVLINK_CLI_DOWNLOAD_H_
#define RCVLINK_CLI_DOWNLOAD_H_

#include <cstdint>
#include <string>

#include "context.h"
#include "destination.h"
#include "receiver.h"

namespace cli {

struct DownloadOptions {
  bool verify = false;        // download twice and compare
  bool keep_partial = false;  // also keep the data of a failed download
};

struct Downloaded {
  uint64_t milliseconds = 0;
  std::string sha256{};
};

// Refuses a file that is too large for the protocol, before minutes are spent on it.
// Throws Failure.
void CheckSize(Receiver& receiver, const RemoteFile& file);

// Copies a file, watching for silence and for Ctrl-C. The destination is complete only when every
// byte that the receiver listed is in it. The data of a file with another size than listed is
// kept: it may be a log that is still being recorded.
// Throws Failure when the file is not complete.
Downloaded Download(Context& context,
                    Receiver& receiver,
                    const RemoteFile& file,
                    Destination& destination,
                    const DownloadOptions& options);

// Whether to try the next file after a failed one. Checks whether the receiver answers.
bool MayGoOn(Receiver& receiver, const Failure& failure);

}  // namespace cli

#endif  // RCVLINK_CLI_DOWNLOAD_H_
