#include <algorithm>
#include <optional>

#include "commands.h"
#include "download.h"
#include "file_report.h"
#include "formats.h"
#include "names.h"
#include "paths.h"
#include "receiver.h"
#include "targets.h"
#include "text.h"

namespace cli {
namespace {

struct Job {
  RemoteFile file;
  std::filesystem::path target;
};

/// Whether a failed download leaves hope for the next file.
bool MayGoOn(const Failure& failure) {
  const bool refused = failure.code == S_OK || failure.code == E_FAIL ||
                       failure.code == ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED);
  return failure.exit == ExitCode::kFailed && refused;
}

/// The files named by the user, checked before anything is transferred.
std::vector<Job> NamedJobs(const Arguments& arguments,
                           const std::vector<std::filesystem::path>& targets,
                           const std::vector<RemoteFile>& files) {
  std::vector<Job> jobs;
  for (std::size_t i = 0; i < targets.size(); ++i) {
    const std::wstring& name = arguments.names[i];
    jobs.push_back({FindFile(files, name, "download " + Printable(name)), targets[i]});
  }
  return jobs;
}

/// All files of the receiver; what cannot be kept is left out and reported.
std::vector<Job> AllJobs(Targets& targets,
                         const std::vector<RemoteFile>& files,
                         FileReport& report) {
  std::vector<Job> jobs;
  for (const RemoteFile& file : files) {
    try {
      if (const auto reason = WhyNotSendable(file.name)) {
        throw Failure{
            .tried = "download " + Printable(file.name), .code = E_INVALIDARG, .meaning = *reason};
      }
      jobs.push_back({file, targets.Choose(file.name)});
    } catch (const Failure& failure) {
      report.AddFailed(file.name, failure);
    }
  }
  return jobs;
}

void TellDone(Context& context, const Job& job, std::uint64_t milliseconds) {
  constexpr std::uint64_t kMsPerSecond = 1000;
  const std::wstring local = job.target.filename().native();
  context.Tell(Printable(job.file.name) + ": " + std::to_string(job.file.size) + " bytes in " +
               FormatDuration(milliseconds / kMsPerSecond) + " -> " +
               Printable(job.target.native()) + "\n");
  if (context.arguments.output.empty() && local != job.file.name) {
    context.Note("  Windows cannot have the receiver's name, so it is kept as " + Printable(local) +
                 "\n");
  }
}

void DownloadAll(Context& context,
                 Receiver& receiver,
                 const std::vector<Job>& jobs,
                 FileReport& report) {
  for (std::size_t i = 0; i < jobs.size(); ++i) {
    const Job& job = jobs[i];
    try {
      const std::uint64_t milliseconds = Download(context, receiver, job.file, job.target);
      TellDone(context, job, milliseconds);
      report.AddDone(job.file.name,
                     {{"path", ToUtf8(job.target.native())},
                      {"bytes", job.file.size},
                      {"milliseconds", milliseconds}});
    } catch (const Failure& failure) {
      report.AddFailed(job.file.name, failure);
      if (MayGoOn(failure)) continue;
      report.AddUntried(jobs.size() - i - 1);
      return;
    }
  }
}

}  // namespace

Outcome RunGet(Context& context) {
  const Arguments& arguments = context.arguments;
  Targets targets(arguments);
  std::vector<std::filesystem::path> named;
  // What is wrong with the names is told before a search that may take minutes.
  for (const std::wstring& name : arguments.names) named.push_back(targets.Choose(name));
  Receiver receiver(context);
  const std::vector<RemoteFile> files = receiver.ListFiles();
  FileReport report(context);
  const std::vector<Job> jobs =
      arguments.all ? AllJobs(targets, files, report) : NamedJobs(arguments, named, files);
  if (!jobs.empty()) MakeFolder(targets.folder());
  DownloadAll(context, receiver, jobs, report);
  if (arguments.all && files.empty()) context.Tell("The receiver has no files.\n");
  return std::move(report).Finish();
}

}  // namespace cli
