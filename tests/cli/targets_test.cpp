#include "targets.h"

#include <gtest/gtest.h>

#include "paths.h"
#include "temporary_folder.h"

namespace cli {
namespace {

class TargetsTest : public testing::Test {
 protected:
  /// Arguments of a download of those names into the test's folder.
  Arguments Into(std::vector<std::wstring> names, const std::wstring& output = L"") const {
    Arguments arguments;
    arguments.command = Command::kGet;
    arguments.names = std::move(names);
    arguments.output = (folder_.path() / output).native();
    return arguments;
  }

  TemporaryFolder folder_;
};

void ExpectRefusal(Targets& targets, const std::wstring& name) {
  try {
    targets.Choose(name);
    ADD_FAILURE() << "was not refused";
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.exit, ExitCode::kLocalFile);
    EXPECT_LT(failure.code, 0);
  }
}

TEST_F(TargetsTest, ASingleFileMayBeNamed) {
  Targets targets(Into({L"a"}, L"monday.dat"));
  EXPECT_EQ(targets.Choose(L"a"), folder_.path() / L"monday.dat");
  EXPECT_TRUE(targets.folder().empty());
}

TEST_F(TargetsTest, AnExistingFolderIsAFolder) {
  Targets targets(Into({L"a"}));
  EXPECT_EQ(targets.Choose(L"a"), folder_.path() / L"a");
}

TEST_F(TargetsTest, AFolderIsMeantBySeparatorByManyAndByAll) {
  Targets separator(Into({L"a"}, L"new/"));
  EXPECT_EQ(separator.Choose(L"a"), folder_.path() / L"new" / L"a");
  Targets many(Into({L"a", L"b"}, L"new"));
  EXPECT_EQ(many.Choose(L"b"), folder_.path() / L"new" / L"b");
  Arguments arguments = Into({}, L"new");
  arguments.all = true;
  Targets all(arguments);
  EXPECT_EQ(all.Choose(L"c"), folder_.path() / L"new" / L"c");
}

TEST_F(TargetsTest, WithoutOutputItIsTheCurrentFolder) {
  Arguments arguments;
  arguments.names = {L"no such file"};
  Targets targets(arguments);
  EXPECT_EQ(targets.Choose(L"no such file"), L"no such file");
}

TEST_F(TargetsTest, NoNameLeavesTheFolder) {
  Targets targets(Into({}));
  for (const wchar_t* name :
       {L"..", L"..\\a", L"../../b", L"C:\\c", L"\\\\h\\s\\d", L"NUL", L"e:f"}) {
    EXPECT_EQ(targets.Choose(name).parent_path(), folder_.path()) << name;
  }
  ExpectRefusal(targets, L"");
}

TEST_F(TargetsTest, AnExistingFileIsKeptUnlessForced) {
  folder_.Write(L"a", "precious");
  Targets targets(Into({L"a"}));
  ExpectRefusal(targets, L"a");
  Arguments arguments = Into({L"a"});
  arguments.force = true;
  Targets forced(arguments);
  EXPECT_EQ(forced.Choose(L"a"), folder_.path() / L"a");
}

TEST_F(TargetsTest, AFolderIsNeverOverwritten) {
  MakeFolder(folder_.path() / L"a");
  Arguments arguments = Into({L"a"});
  arguments.force = true;
  Targets targets(arguments);
  ExpectRefusal(targets, L"a");
}

TEST_F(TargetsTest, TwoNamesNeverShareAFile) {
  Arguments arguments = Into({});
  arguments.force = true;
  Targets targets(arguments);
  targets.Choose(L"LOG");
  ExpectRefusal(targets, L"LOG");
  ExpectRefusal(targets, L"log");
  ExpectRefusal(targets, L"log.part");  // LOG grows under that name
  targets.Choose(L"x.part");
  ExpectRefusal(targets, L"X");
  targets.Choose(L"a/b");
  ExpectRefusal(targets, L"a%2Fb");
}

}  // namespace
}  // namespace cli
