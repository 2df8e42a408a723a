#include <algorithm>
#include <optional>

#include "command.h"
#include "download.h"
#include "file_report.h"
#include "formats.h"
#include "names.h"
#include "options.h"
#include "part_file.h"
#include "paths.h"
#include "receiver.h"
#include "targets.h"
#include "text.h"

namespace cli {
namespace {

constexpr std::wstring_view kStandardOutput = L"-";
constexpr std::wstring_view kNullDevice = L"NUL";

struct Job {
  RemoteFile file;
  std::filesystem::path target;
};

/// Whether a failed download leaves hope for the next file.
bool MayGoOn(const Failure& failure) {
  const bool refused = failure.code == S_OK || failure.code == E_FAIL ||
                       failure.code == ResultOfWin32(ERROR_CRC) ||
                       failure.code == ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED);
  return failure.exit == ExitCode::kFailed && refused;
}

class Get : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddNames(app, "NAME", "Files as `ls` shows them", names_, 0, kMostNames);
    AddText(app,
            "-o",
            "The folder, or the name for a single file; - is the standard output",
            "PATH",
            output_);
    AddFlag(app, "--all", "Every file of the receiver", all_);
    AddFlag(app, "--verify", "Download twice and compare", download_.verify);
    AddFlag(app,
            "--keep-partial",
            "Keep what came of a failed download, as NAME.part",
            download_.keep_partial);
  }

  void Check() const override {
    CheckNames(names_);
    if (output_ == kStandardOutput && (all_ || names_.size() != 1)) {
      throw UsageError("-o - takes a single file");
    }
    if (all_ == !names_.empty()) throw UsageError("get needs either the names of files or --all");
  }

  Outcome Run(Context& context) override {
    const bool force = context.arguments.force;
    if (output_ == kStandardOutput && context.arguments.json) {
      throw UsageError("-o - and --json both need the standard output");
    }
    Targets targets(
        {.output = IsStream() ? L"" : output_, .many = all_ || names_.size() > 1, .force = force});
    std::vector<std::filesystem::path> named;
    // What is wrong on this computer is told before a search that may take minutes.
    if (!IsStream()) targets.CheckFolder();
    for (const std::wstring& name : names_) {
      named.push_back(IsStream() ? std::filesystem::path(output_) : targets.Choose(name));
    }
    Receiver receiver(context);
    const Directory directory = receiver.ListFiles();
    FileReport report(context);
    const std::vector<Job> jobs = all_ ? AllJobs(receiver, targets, directory.files, report)
                                       : NamedJobs(receiver, named, directory.files);
    if (!IsStream()) CheckRoom(targets, jobs);
    if (!IsStream() && !jobs.empty()) MakeFolder(targets.folder());
    DownloadAll(context, receiver, jobs, report);
    if (all_) report.SetComplete(directory.doubt);
    if (all_ && directory.files.empty()) context.PrintDone("The receiver lists no files.\n");
    return std::move(report).Finish();
  }

 private:
  bool IsStream() const {
    return output_ == kStandardOutput || SameLocalName(output_, kNullDevice);
  }

  std::unique_ptr<Destination> Open(Context& context, const Job& job) const {
    if (output_ == kStandardOutput) return std::make_unique<ToOutput>(context.out);
    if (IsStream()) return std::make_unique<Nowhere>();
    return std::make_unique<PartFile>(job.target, context.arguments.force);
  }

  /// The files named by the user, checked before anything is transferred.
  std::vector<Job> NamedJobs(Receiver& receiver,
                             const std::vector<std::filesystem::path>& targets,
                             const std::vector<RemoteFile>& files) const {
    std::vector<Job> jobs;
    for (std::size_t i = 0; i < targets.size(); ++i) {
      const std::wstring& name = names_[i];
      const RemoteFile& file = FindFile(files, name, "download " + Printable(name));
      CheckSize(receiver, file);
      jobs.push_back({file, targets[i]});
    }
    return jobs;
  }

  /// All files of the receiver; what cannot be had or kept is left out and reported.
  std::vector<Job> AllJobs(Receiver& receiver,
                           Targets& targets,
                           const std::vector<RemoteFile>& files,
                           FileReport& report) const {
    std::vector<Job> jobs;
    for (const RemoteFile& file : files) {
      try {
        if (const auto reason = WhyNotSendable(file.name)) {
          throw Failure{.tried = "download " + Printable(file.name),
                        .code = E_INVALIDARG,
                        .meaning = *reason};
        }
        CheckSize(receiver, file);
        jobs.push_back(
            {file, IsStream() ? std::filesystem::path(output_) : targets.Choose(file.name)});
      } catch (const Failure& failure) {
        report.AddFailed(file.name, failure);
      }
    }
    return jobs;
  }

  static void CheckRoom(const Targets& targets, const std::vector<Job>& jobs) {
    std::uint64_t total = 0;
    for (const Job& job : jobs) total += job.file.size;
    targets.CheckRoom(total);
  }

  void DownloadAll(Context& context,
                   Receiver& receiver,
                   const std::vector<Job>& jobs,
                   FileReport& report) const {
    for (std::size_t i = 0; i < jobs.size(); ++i) {
      const Job& job = jobs[i];
      try {
        const auto destination = Open(context, job);
        const Downloaded downloaded =
            Download(context, receiver, job.file, *destination, download_);
        PrintDownload(context, job, downloaded);
        report.AddDone(job.file.name,
                       {{"path", ToUtf8(job.target.native())},
                        {"bytes", job.file.size},
                        {"milliseconds", downloaded.milliseconds},
                        {"sha256", downloaded.sha256},
                        {"verified", download_.verify}});
      } catch (const Failure& failure) {
        report.AddFailed(job.file.name, failure);
        if (MayGoOn(failure)) continue;
        report.AddUntried(jobs.size() - i - 1);
        return;
      }
    }
  }

  void PrintDownload(Context& context, const Job& job, const Downloaded& downloaded) const {
    constexpr std::uint64_t kMsPerSecond = 1000;
    std::string text = Printable(job.file.name) + ": " + std::to_string(job.file.size) +
                       " bytes in " + FormatDuration(downloaded.milliseconds / kMsPerSecond) +
                       " -> " + Printable(job.target.native()) + "\n";
    if (context.arguments.verbose) text += "  SHA-256 " + downloaded.sha256 + "\n";
    if (output_ == kStandardOutput) {
      context.PrintStatus(text);
    } else {
      context.PrintDone(text);
    }
    const std::wstring local = job.target.filename().native();
    if (output_.empty() && local != job.file.name) {
      context.PrintStatus("  Windows cannot have the receiver's name, so it is kept as " +
                          Printable(local) + "\n");
    }
  }

  std::vector<std::wstring> names_;
  std::wstring output_;
  bool all_ = false;
  DownloadOptions download_;
};

}  // namespace

std::unique_ptr<Command> MakeGet() {
  return std::make_unique<Get>(Command::Text{
      "get",
      "Download files, or all of them",
      "Each file grows as NAME.part and gets its name when it is complete.\n"
      "The protocol of Velmar receivers does not find a damaged byte: --verify does.\n"
      "Examples:\n"
      "  rcvlink-cli get COM7 LOG0001.DAT\n"
      "  rcvlink-cli get COM7 LOG0001.DAT -o monday.dat --force\n"
      "  rcvlink-cli get COM7 --all -o D:\\survey\\"});
}

}  // namespace cli
