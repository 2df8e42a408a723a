#include <algorithm>
#include <map>
#include <optional>

#include "command.h"
#include "download.h"
#include "file_report.h"
#include "formats.h"
#include "local_files.h"
#include "mirror_file.h"
#include "mirror_plan.h"
#include "names.h"
#include "options.h"
#include "paths.h"
#include "targets.h"
#include "text.h"
#include "wildcard.h"

namespace cli {
namespace {

struct MirrorOptions {
  std::vector<std::wstring> patterns{};  // empty: all files
  std::wstring folder{};
  std::optional<TimeZone> times{};  // nothing: files have the time of their download
  bool verify = false;
  bool deletes = false;
};

// The local files of a mirror. Existing ones may be replaced, by the rules of `Mirror`.
// Throws Failure when the folder cannot be used: checked before a search that may take minutes.
Targets TargetsIn(const std::wstring& folder) {
  Targets targets({.output = folder, .many = true, .force = true});
  targets.CheckFolder();
  return targets;
}

// One execution of `mirror`. It goes on after a file that failed; the worst exit code counts.
class MirrorRun {
 public:
  MirrorRun(Context& context, const MirrorOptions& options)
      : context_(context),
        options_(options),
        targets_(TargetsIn(options.folder)),
        receiver_(context),
        report_(context) {}

  Outcome Run() {
    const Directory directory = receiver_.ListFiles();
    const std::vector<RemoteFile>& files = directory.files;
    doubt_ = directory.doubt;
    const std::vector<MirrorJob> jobs = Plan(files);
    PrintPlan(jobs);
    targets_.CheckRoom(new_bytes_);
    if (!jobs.empty()) MakeFolder(options_.folder);
    MirrorAll(jobs);
    if (!asked_to_delete_.empty()) CheckDeleted(files.size());
    for (auto& [name, details] : done_) report_.AddDone(name, details);
    PrintSummary();
    return Finish();
  }

 private:
  struct Summary {
    size_t downloaded = 0;
    size_t present = 0;
    size_t failed = 0;
    size_t deleted = 0;
    size_t untried = 0;
  };

  bool IsWanted(const std::wstring& name) const {
    const auto fits = [&name](const std::wstring& pattern) { return FitsPattern(name, pattern); };
    return options_.patterns.empty() ||
           std::any_of(options_.patterns.begin(), options_.patterns.end(), fits);
  }

  std::vector<MirrorJob> Plan(const std::vector<RemoteFile>& files) {
    std::vector<MirrorJob> jobs;
    for (const RemoteFile& file : files) {
      if (!IsWanted(file.name)) continue;
      try {
        if (const auto reason = WhyNotSendable(file.name)) {
          throw Failure{
              .tried = "mirror " + Printable(file.name), .code = E_INVALIDARG, .meaning = *reason};
        }
        CheckSize(receiver_, file);
        const std::filesystem::path target = targets_.Choose(file.name);
        jobs.push_back({file, target, StepFor(file.size, SizeOf(target), options_.deletes)});
      } catch (const Failure& failure) {
        AddFailed(file.name, failure);
      }
    }
    return jobs;
  }

  void PrintPlan(const std::vector<MirrorJob>& jobs) {
    for (const MirrorJob& job : jobs) {
      total_.total += BytesOf(job, options_.verify);
      if (job.step == MirrorStep::kDownload) new_bytes_ += job.file.size;
      total_.files += job.step != MirrorStep::kNothing;
    }
    context_.PrintStatus("Files to mirror: " + std::to_string(jobs.size()) +
                         ", already here: " + std::to_string(jobs.size() - total_.files) + "; " +
                         FormatBytes(total_.total) + " to download.\n");
    if (options_.times) {
      context_.PrintStatus("File times are taken as " + InWords(*options_.times) + ".\n");
    }
  }

  void MirrorAll(const std::vector<MirrorJob>& jobs) {
    const uint64_t start_ms = GetTickCount64();
    for (size_t i = 0; i < jobs.size(); ++i) {
      const MirrorJob& job = jobs[i];
      total_.elapsed_ms = GetTickCount64() - start_ms;
      try {
        MirrorOne(job);
      } catch (const Failure& failure) {
        AddFailed(job.file.name, failure);
        const size_t untried = jobs.size() - i - 1;
        if (untried > 0 && !MayGoOn(receiver_, failure)) {
          summary_.untried = untried;
          report_.AddUntried(summary_.untried);
          break;
        }
      }
      total_.done += BytesOf(job, options_.verify);
    }
    total_.elapsed_ms = GetTickCount64() - start_ms;
  }

  void MirrorOne(const MirrorJob& job) {
    const std::wstring& name = job.file.name;
    Json details = {{"path", ToUtf8(job.target.native())}, {"bytes", job.file.size}};
    if (job.step == MirrorStep::kNothing) {
      ++summary_.present;
      details["done"] = "nothing";
      done_.emplace_back(name, details);
      return;
    }
    ++total_.file;
    receiver_.ThrowIfCancelled("mirror " + Printable(name));
    context_.PrintStatus(InWords(total_, name, job.file.size) + "\n");
    const std::string sha256 = Mirror(context_, receiver_, job, options_.verify);
    const bool came = job.step != MirrorStep::kCompare;
    ++(came ? summary_.downloaded : summary_.present);
    if (came) SetTimeOf(job);
    const bool verified = job.file.size > 0 && (options_.verify || !came);
    details["done"] = came ? "downloaded" : "compared";
    details["verified"] = verified;
    details["sha256"] = sha256.empty() ? Json(nullptr) : Json(sha256);
    if (came) context_.PrintDone(Printable(name) + " -> " + Printable(job.target.native()) + "\n");
    if (verified && options_.deletes) Delete(name);
    done_.emplace_back(name, details);
  }

  void SetTimeOf(const MirrorJob& job) {
    if (!options_.times) return;
    if (const auto time = ToFileTime(job.file.time, *options_.times)) SetTime(job.target, *time);
  }

  void Delete(std::wstring name) {
    const std::string tried = "delete " + Printable(name);
    receiver_.ThrowIfCancelled(tried);
    const long code = devapi::DeleteFileW(receiver_.handle(), name.data());
    if (code != S_OK) throw receiver_.FailureOf(tried, code);
    asked_to_delete_.push_back(name);
  }

  // The library may not notice a refusal, so the directory is read again.
  void CheckDeleted(size_t listed_before) {
    std::vector<RemoteFile> files;
    std::optional<Failure> unread;
    try {
      files = receiver_.ListFiles().files;
      if (files.empty() && listed_before > asked_to_delete_.size()) {
        // An empty list is no answer: the files that were not deleted are missing too.
        unread = Failure{.code = ResultOfWin32(ERROR_TIMEOUT),
                         .meaning = "the receiver did not list its files again"};
      }
    } catch (const Failure& failure) {
      unread = failure;
    }
    for (const std::wstring& name : asked_to_delete_) {
      const std::string tried = "delete " + Printable(name);
      if (unread) {
        unread->tried = tried;
        AddFailed(name, *unread);
      } else if (HasFile(files, name)) {
        AddFailed(name,
                  {.tried = tried,
                   .code = S_OK,
                   .meaning = "the command was sent, but the receiver still has the file"});
      } else {
        ++summary_.deleted;
        const auto entry = std::find_if(
            done_.begin(), done_.end(), [&](const auto& done) { return done.first == name; });
        entry->second["deleted"] = true;
      }
    }
  }

  void AddFailed(const std::wstring& name, const Failure& failure) {
    ++summary_.failed;
    worst_ = Worse(worst_, failure.exit);
    report_.AddFailed(name, failure);
  }

  void PrintSummary() {
    constexpr uint64_t kMsPerSecond = 1000;
    std::string text = std::to_string(summary_.downloaded) + " downloaded, " +
                       std::to_string(summary_.present) + " already here, " +
                       std::to_string(summary_.failed) + " failed";
    if (summary_.untried > 0) text += ", " + std::to_string(summary_.untried) + " not tried";
    if (options_.deletes) text += ", " + std::to_string(summary_.deleted) + " deleted";
    context_.PrintDone(text + "; " + FormatDuration(total_.elapsed_ms / kMsPerSecond) + "\n");
  }

  Outcome Finish() {
    report_.SetComplete(doubt_);
    Outcome outcome = std::move(report_).Finish();
    outcome.document["folder"] = ToUtf8(options_.folder);
    outcome.document["summary"] = {{"downloaded", summary_.downloaded},
                                   {"present", summary_.present},
                                   {"failed", summary_.failed},
                                   {"untried", summary_.untried},
                                   {"deleted", summary_.deleted}};
    outcome.exit = doubt_.empty() ? worst_ : Worse(worst_, ExitCode::kFailed);
    return outcome;
  }

  Context& context_;
  const MirrorOptions& options_;
  Targets targets_;
  Receiver receiver_;
  FileReport report_;
  std::string doubt_;
  MirrorState total_;
  uint64_t new_bytes_ = 0;  // that the disk needs room for
  Summary summary_;
  ExitCode worst_ = ExitCode::kDone;
  // Reported at the end, when it is known what was deleted.
  std::vector<std::pair<std::wstring, Json>> done_;
  std::vector<std::wstring> asked_to_delete_;
};

class MirrorCommand : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddText(app, "FOLDER", "Folder for the files", "", options_.folder, Need::kRequired);
    AddNames(app,
             "PATTERN",
             "Only files that match, as in *.JPS; default: all files",
             options_.patterns,
             0,
             kMostNames);
    AddWord<TimeZone>(app,
                      "--times",
                      "Set file times as on the receiver, whose clock is utc or local",
                      "ZONE",
                      {{"utc", TimeZone::kUtc}, {"local", TimeZone::kLocal}},
                      options_.times);
    AddFlag(app, "--verify", "Download each file twice and compare", options_.verify);
    AddFlag(app,
            "--then-delete",
            "Then delete files on the receiver that were verified",
            options_.deletes);
  }

  void Check() const override {
    CheckNames(options_.patterns);
    if (options_.folder.empty()) throw UsageError("the folder name is empty");
  }

  Outcome Run(Context& context) override {
    MirrorOptions options = options_;
    options.verify = options.verify || options.deletes;
    return MirrorRun(context, options).Run();
  }

 private:
  MirrorOptions options_;
};

}  // namespace

std::unique_ptr<Command> MakeMirror() {
  return std::make_unique<MirrorCommand>(Command::Text{
      "mirror",
      "Update a folder with the receiver's files",
      "Files that are missing or differ in size are downloaded. After a file that failed, the\n"
      "next one follows; the exit code is that of the worst failure.\n"
      "A file of this computer is replaced only when the receiver's file begins with the same\n"
      "bytes, such as a log that has grown.\n"
      "--then-delete deletes a file only after a second download was equal to the first.\n"
      "Examples:\n"
      "  rcvlink-cli mirror COM7 D:\\survey\n"
      "  rcvlink-cli mirror COM7 D:\\survey *.JPS --times utc --then-delete"});
}

}  // namespace cli
