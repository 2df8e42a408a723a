/// @file download.h
/// One file from the receiver to the disk.
#ifndef RCVLINK_CLI_DOWNLOAD_H_
#define RCVLINK_CLI_DOWNLOAD_H_

#include <filesystem>

#include "context.h"
#include "receiver.h"

namespace cli {

/// Copies a file, watching for silence and for Ctrl-C. The target appears only when every byte that
/// the receiver listed is in it.
/// @param overwrite whether the target may be replaced
/// @return milliseconds that it took
/// @throws Failure when the file is not complete; nothing is left of it then
std::uint64_t Download(Context& context,
                       Receiver& receiver,
                       const RemoteFile& file,
                       const std::filesystem::path& target,
                       bool overwrite);

}  // namespace cli

#endif  // RCVLINK_CLI_DOWNLOAD_H_
