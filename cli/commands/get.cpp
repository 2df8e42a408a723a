#include <algorithm>
#include <map>
#include <optional>

#include "command.h"
#include "download.h"
#include "file_report.h"
#include "formats.h"
#include "local_files.h"
#include "names.h"
#include "options.h"
#include "part_file.h"
#include "paths.h"
#include "receiver.h"
#include "targets.h"
#include "text.h"
#include "wildcard.h"

namespace cli {
namespace {

constexpr std::wstring_view kStandardOutput = L"-";
constexpr std::wstring_view kNullDevice = L"NUL";

struct GetOptions {
  std::vector<std::wstring> names{};  // of files, or patterns of names
  std::wstring output{};
  bool all = false;
  bool skip_existing = false;
  DownloadOptions download{};

  bool ToStandardOutput() const { return output == kStandardOutput; }

  // Whether no file of this computer is made.
  bool IsStream() const { return ToStandardOutput() || SameLocalName(output, kNullDevice); }

  // Whether it is known which files are wanted, whatever the receiver lists.
  bool NamesInFull() const { return !all && std::none_of(names.begin(), names.end(), IsPattern); }

  bool IsOneFile() const { return !all && names.size() == 1 && !IsPattern(names.front()); }
};

// Where a file goes.
struct Spot {
  std::filesystem::path target{};
  bool is_taken = false;  // by a file that stays, so that there is nothing to download
};

struct Job {
  RemoteFile file;
  std::filesystem::path target;
};

// One execution of `get`. A file that cannot be downloaded or saved does not stop the others.
class GetRun {
 public:
  GetRun(Context& context, const GetOptions& options)
      : context_(context),
        options_(options),
        targets_({.output = options.IsStream() ? L"" : options.output,
                  .many = !options.IsOneFile(),
                  .force = context.arguments.force}),
        report_(context) {}

  Outcome Run() {
    // Errors on this computer are reported before a search that may take minutes.
    if (!options_.IsStream()) targets_.CheckFolder();
    const std::vector<std::wstring> wishes = Wishes();
    if (!options_.all && wishes.empty()) return std::move(report_).Finish();
    Receiver receiver(context_);
    const Directory directory = receiver.ListFiles();
    const std::vector<RemoteFile> files =
        options_.all ? directory.files : Wanted(wishes, directory.files);
    const std::vector<Job> jobs = Plan(receiver, files);
    if (!options_.IsStream()) CheckRoom(jobs);
    if (!options_.IsStream() && !jobs.empty()) MakeFolder(targets_.folder());
    DownloadAll(receiver, jobs);
    if (!options_.NamesInFull()) report_.SetComplete(directory.doubt);
    if (options_.all && files.empty()) context_.PrintDone("The receiver lists no files.\n");
    return std::move(report_).Finish();
  }

 private:
  // The names and patterns of the command line, without names that cannot be saved here.
  std::vector<std::wstring> Wishes() {
    std::vector<std::wstring> wishes;
    for (const std::wstring& name : options_.names) {
      if (std::find(wishes.begin(), wishes.end(), name) != wishes.end()) continue;
      try {
        if (!IsPattern(name)) spots_.emplace(name, Choose(name));
        wishes.push_back(name);
      } catch (const Failure& failure) {
        report_.AddFailed(name, failure);
      }
    }
    return wishes;
  }

  Spot Choose(const std::wstring& name) {
    if (options_.IsStream()) return {.target = options_.output};
    if (options_.skip_existing) {
      if (const auto existing = targets_.TakeExisting(name)) {
        return {.target = *existing, .is_taken = true};
      }
    }
    return {.target = targets_.Choose(name)};
  }

  // The receiver's files that were named, each once.
  // Throws Failure when there is none for one of the names: nothing is transferred then.
  static std::vector<RemoteFile> Wanted(const std::vector<std::wstring>& wishes,
                                        const std::vector<RemoteFile>& files) {
    std::vector<RemoteFile> wanted;
    const auto add = [&wanted](const RemoteFile& file) {
      if (!HasFile(wanted, file.name)) wanted.push_back(file);
    };
    for (const std::wstring& wish : wishes) {
      if (!IsPattern(wish)) {
        add(FindFile(files, wish, "download " + Printable(wish)));
        continue;
      }
      const auto fits = [&wish](const RemoteFile& file) { return FitsPattern(file.name, wish); };
      if (std::none_of(files.begin(), files.end(), fits)) {
        throw Failure{.tried = "download " + Printable(wish),
                      .code = ResultOfWin32(ERROR_FILE_NOT_FOUND),
                      .meaning = "no file of the receiver matches this pattern",
                      .hint = "`rcvlink-cli ls` lists the files. Nothing was done."};
      }
      for (const RemoteFile& file : files) {
        if (fits(file)) add(file);
      }
    }
    return wanted;
  }

  // The files to transfer. Those that cannot be transferred or saved are reported instead.
  std::vector<Job> Plan(Receiver& receiver, const std::vector<RemoteFile>& files) {
    std::vector<Job> jobs;
    for (const RemoteFile& file : files) {
      try {
        if (const auto reason = WhyNotSendable(file.name)) {
          throw Failure{.tried = "download " + Printable(file.name),
                        .code = E_INVALIDARG,
                        .meaning = *reason};
        }
        const auto chosen = spots_.extract(file.name);
        const Spot spot = chosen ? chosen.mapped() : Choose(file.name);
        if (spot.is_taken) {
          Skip(file, spot.target);
          continue;
        }
        CheckSize(receiver, file);
        jobs.push_back({file, spot.target});
      } catch (const Failure& failure) {
        report_.AddFailed(file.name, failure);
      }
    }
    return jobs;
  }

  // Keeps an existing file as it is. Warns when it has another size.
  void Skip(const RemoteFile& file, const std::filesystem::path& target) {
    const uint64_t here = SizeOf(target).value_or(0);
    report_.AddDone(file.name,
                    {{"path", ToUtf8(target.native())}, {"bytes", here}, {"skipped", true}});
    const std::string start = Printable(file.name) + ": already exists";
    if (here == file.size) {
      context_.PrintDone(start + "\n");
    } else {
      context_.PrintWarning(start + ", with " + std::to_string(here) +
                            " bytes; the receiver lists " + std::to_string(file.size) + "\n");
    }
  }

  void CheckRoom(const std::vector<Job>& jobs) const {
    uint64_t total = 0;
    for (const Job& job : jobs) total += job.file.size;
    targets_.CheckRoom(total);
  }

  std::unique_ptr<Destination> Open(const Job& job) const {
    if (options_.ToStandardOutput()) return std::make_unique<ToOutput>(context_.out);
    if (options_.IsStream()) return std::make_unique<Nowhere>();
    const bool force = context_.arguments.force;
    return std::make_unique<PartFile>(job.target,
                                      PartFile::Overwrite{.part = force, .target = force});
  }

  void DownloadAll(Receiver& receiver, const std::vector<Job>& jobs) {
    for (size_t i = 0; i < jobs.size(); ++i) {
      const size_t untried = jobs.size() - i - 1;
      try {
        DownloadOne(receiver, jobs[i]);
      } catch (const Failure& failure) {
        report_.AddFailed(jobs[i].file.name, failure);
        if (untried == 0 || MayGoOn(receiver, failure)) continue;
        report_.AddUntried(untried);
        return;
      }
    }
  }

  void DownloadOne(Receiver& receiver, const Job& job) {
    const auto destination = Open(job);
    const Downloaded downloaded =
        Download(context_, receiver, job.file, *destination, options_.download);
    PrintDownload(job, downloaded);
    report_.AddDone(job.file.name,
                    {{"path", ToUtf8(job.target.native())},
                     {"bytes", job.file.size},
                     {"milliseconds", downloaded.milliseconds},
                     {"sha256", downloaded.sha256},
                     {"verified", options_.download.verify}});
  }

  void PrintDownload(const Job& job, const Downloaded& downloaded) {
    constexpr uint64_t kMsPerSecond = 1000;
    std::string text = Printable(job.file.name) + ": " + std::to_string(job.file.size) +
                       " bytes in " + FormatDuration(downloaded.milliseconds / kMsPerSecond) +
                       " -> " + Printable(job.target.native()) + "\n";
    if (context_.arguments.verbose) text += "  SHA-256 " + downloaded.sha256 + "\n";
    if (options_.ToStandardOutput()) {
      context_.PrintStatus(text);
    } else {
      context_.PrintDone(text);
    }
    const std::wstring local = job.target.filename().native();
    if (options_.output.empty() && local != job.file.name) {
      context_.PrintStatus("  Windows does not allow the receiver's name; the file is saved as " +
                           Printable(local) + "\n");
    }
  }

  Context& context_;
  const GetOptions& options_;
  Targets targets_;
  FileReport report_;
  std::map<std::wstring, Spot> spots_;  // of files named in full, until they are planned
};

class Get : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddNames(app,
             "NAME",
             "File names as listed by `ls`, or patterns such as *.JPS",
             options_.names,
             0,
             kMostNames);
    AddText(app,
            "-o",
            "Folder, or name of a single file; - is the standard output",
            "PATH",
            options_.output);
    AddFlag(app, "--all", "Download every file of the receiver", options_.all);
    AddFlag(
        app, "--skip-existing", "Skip files that exist on this computer", options_.skip_existing);
    AddFlag(app, "--verify", "Download twice and compare", options_.download.verify);
    AddFlag(app,
            "--keep-partial",
            "Keep the data of a failed download as NAME.part",
            options_.download.keep_partial);
  }

  void Check() const override {
    CheckNames(options_.names);
    if (options_.ToStandardOutput() && !options_.IsOneFile()) {
      throw UsageError("-o - takes a single file");
    }
    if (options_.all == !options_.names.empty()) {
      throw UsageError("get needs either file names or --all");
    }
    if (options_.IsStream() && options_.skip_existing) {
      throw UsageError("--skip-existing needs a folder or a file, not -o " +
                       Printable(options_.output));
    }
  }

  Outcome Run(Context& context) override {
    if (options_.ToStandardOutput() && context.arguments.json) {
      throw UsageError("-o - and --json both need the standard output");
    }
    if (options_.skip_existing && context.arguments.force) {
      throw UsageError("--skip-existing and --force cannot be used together");
    }
    return GetRun(context, options_).Run();
  }

 private:
  GetOptions options_;
};

}  // namespace

std::unique_ptr<Command> MakeGet() {
  return std::make_unique<Get>(Command::Text{
      "get",
      "Download files",
      "A file is written as NAME.part and gets its name when it is complete.\n"
      "The protocol of Velmar receivers does not detect damaged bytes; --verify does.\n"
      "Examples:\n"
      "  rcvlink-cli get COM7 LOG0001.DAT\n"
      "  rcvlink-cli get COM7 LOG0001.DAT -o monday.dat --force\n"
      "  rcvlink-cli get COM7 *.JPS --skip-existing\n"
      "  rcvlink-cli get COM7 --all -o D:\\survey\\"});
}

}  // namespace cli
