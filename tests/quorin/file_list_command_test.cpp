// The directory listing: one message an entry, over a connection.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/hresult.h"
#include "quorin/commands.h"
#include "tests/quorin/quorin_responder.h"
#include "tests/support/scripted_connection.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using namespace QuorinCommands;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr uint32_t kFlags = 4098;
constexpr char kListCommand[] = "print,/log/&[name,size,time]\r\n";

class QuorinFileList : public testing::Test {
 protected:
  // Answers with these messages, `at_once` in one read or each in its own.
  void Answer(std::vector<std::string> bodies, bool at_once = false) {
    receiver.On(kListCommand, [this, bodies, at_once](const std::string& tag) {
      std::string all;
      for (const std::string& body : bodies) {
        const std::string message = Message("RE", tag + body) + "\r\n";
        if (!at_once) connection.GiveRead(message);
        all += message;
      }
      if (at_once) connection.GiveRead(all);
    });
  }
  HRESULT Execute() { return command.Execute(&connection, nullptr); }
  std::vector<std::wstring> Names() const {
    std::vector<std::wstring> names;
    for (const FileEntry& entry : command.Entries()) names.push_back(entry.name);
    return names;
  }

  ScriptedConnection connection;
  QuorinResponder receiver{connection};
  CGetFileListCmd command{kFlags};
};

TEST_F(QuorinFileList, IsEmptyWhenABraceCloses) {
  Answer({"{}"});
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_THAT(Names(), IsEmpty());
  EXPECT_EQ(command.Result(), S_OK);
  EXPECT_EQ(connection.AnswersLeft(), 0U);
}

TEST_F(QuorinFileList, HasAnEntry) {
  Answer({"{{A.log,10,0}}"});
  EXPECT_EQ(Execute(), S_OK);
  ASSERT_THAT(Names(), ElementsAre(L"A.log"));
  EXPECT_EQ(command.Entries()[0].size, 10U);
  EXPECT_EQ(command.Entries()[0].time.wYear, 1988);
  EXPECT_EQ(command.Result(), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kReply);
}

TEST_F(QuorinFileList, HasOneEntryOfEachMessageOfTheSameRead) {
  Answer({"{{A,1,0}", "{B,2,0}", "{C,3,0}}"}, true);
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_THAT(Names(), ElementsAre(L"A", L"B", L"C"));
}

TEST_F(QuorinFileList, HasOneEntryOfEachRead) {
  Answer({"{{A,1,0}", "{B,2,0}", "{C,3,0}}"});
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_THAT(Names(), ElementsAre(L"A", L"B", L"C"));
}

TEST_F(QuorinFileList, IsTheSameHoweverItIsCut) {
  size_t whole = 2;
  for (size_t cut = 1; cut < whole; ++cut) {
    receiver.On(kListCommand, [&](const std::string& tag) {
      const std::string bytes = Message("RE", tag + "{{A,1,0}") + "\r\n" +
                                Message("RE", tag + "{B,2,0}") + Message("RE", tag + "{C,3,0}}");
      whole = bytes.size();
      connection.GiveRead(bytes.substr(0, cut));
      connection.GiveRead(bytes.substr(cut));
    });
    CGetFileListCmd list(kFlags);
    EXPECT_EQ(list.Execute(&connection, nullptr), S_OK) << "cut at " << cut;
    EXPECT_EQ(list.Entries().size(), 3U) << "cut at " << cut;
  }
}

TEST_F(QuorinFileList, EndsWithABraceInAMessageOfItsOwn) {
  Answer({"{{A,1,0}", "}"});
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_THAT(Names(), ElementsAre(L"A"));
}

TEST_F(QuorinFileList, TakesNothingAfterItsEnd) {
  Answer({"{{A,1,0}}", "{B,2,0}}"}, true);
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_THAT(Names(), ElementsAre(L"A"));
}

TEST_F(QuorinFileList, WaitsForTheEntriesThatAreMissing) {
  Answer({"{{A,1,0}", "{B,2,0}"});
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_EQ(command.Result(), kTimedOut);
  EXPECT_THAT(Names(), ElementsAre(L"A", L"B"));
}

TEST_F(QuorinFileList, IsNotDoneByAMessageOfBracesAlone) {
  Answer({"{{"});
  EXPECT_EQ(Execute(), S_FALSE);
  EXPECT_THAT(Names(), IsEmpty());
  EXPECT_EQ(command.Result(), S_OK);
}

TEST_F(QuorinFileList, FailsOnARefusal) {
  receiver.Reply(kListCommand, "{A,1,0}}", "ER");
  EXPECT_EQ(Execute(), kNotConnected);
  EXPECT_EQ(command.Result(), kNotConnected);
  EXPECT_EQ(command.Kind(), ReplyKind::kError);
  EXPECT_THAT(Names(), IsEmpty());
}

TEST_F(QuorinFileList, FailsOnARefusalAmongTheEntries) {
  receiver.On(kListCommand, [this](const std::string& tag) {
    connection.GiveRead(Message("RE", tag + "{{A,1,0}") + Message("ER", tag + "{gone}"));
  });
  EXPECT_EQ(Execute(), kNotConnected);
  EXPECT_EQ(command.Result(), kNotConnected);
}

TEST_F(QuorinFileList, IsNotReadFromABlankMessage) {
  receiver.Reply(kListCommand, "{{A,1,0}}", "  ");
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
  EXPECT_THAT(Names(), IsEmpty());
}

TEST_F(QuorinFileList, KeepsAnEntryWithATimeThatCannotBeConverted) {
  Answer({"{{A,1,99999999999999}}"});
  EXPECT_EQ(Execute(), S_OK);
  ASSERT_THAT(Names(), ElementsAre(L"A"));
  EXPECT_EQ(command.Entries()[0].time.wYear, 0);
  EXPECT_EQ(command.Entries()[0].time.wMonth, 0);
}

TEST_F(QuorinFileList, KeepsItsReply) {
  Answer({"{{A,1,0}", "{B,2,0}}"});
  Execute();
  EXPECT_EQ(std::string(command.GetReply(), command.GetReply() + command.GetReplyLength()),
            "{{A,1,0}{B,2,0}}");
}

// More messages than fit the buffer, which ends so many bytes into one of them.
class QuorinLongFileList : public QuorinFileList {
 protected:
  void AnswerBeyondTheBuffer(size_t bytes_of_the_last) {
    receiver.On(kListCommand, [this, bytes_of_the_last](const std::string& tag) {
      const std::string message = Message("RE", tag + "{0123456789ABCDEF,1,0}");
      std::string all((kBufferLength - bytes_of_the_last) % message.size(), '*');
      while (all.size() < 2 * kBufferLength) all += message;
      connection.GiveRead(all);
    });
  }

  static constexpr size_t kBufferLength = 65536;
};

TEST_F(QuorinLongFileList, FailsWhenAMessageDoesNotFitTheBuffer) {
  AnswerBeyondTheBuffer(20);
  EXPECT_EQ(Execute(), kNotConnected);
  EXPECT_GT(command.Entries().size(), 1000U);
}

TEST_F(QuorinLongFileList, EndsWhenTheBufferIsFullBetweenTwoMessages) {
  AnswerBeyondTheBuffer(0);
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
}

TEST_F(QuorinFileList, MayFillTheBufferAlmost) {
  std::vector<std::string> bodies(1500, "{0123456789ABCDEF,1,0}");
  bodies.back() = "{last,1,0}}";
  Answer(bodies);
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_EQ(command.Entries().size(), 1500U);
  EXPECT_EQ(command.Entries().back().name, L"last");
}

TEST_F(QuorinFileList, EndsWithABlankReplyWhenAReadGivesNothing) {
  connection.GiveRead("");
  EXPECT_EQ(Execute(), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
  EXPECT_THAT(Names(), IsEmpty());
}

class ForgetfulList : public CGetFileListCmd {
 public:
  ForgetfulList() : CGetFileListCmd(kFlags) {}
  HRESULT AppendReply(const void*, uint32_t) override { return E_OUTOFMEMORY; }
};

TEST(QuorinFileListMessage, WithoutMemoryForTheBodyOfARefusalLeavesKindAndDone) {
  ForgetfulList list;
  bool done = false;
  EXPECT_EQ(list.ParseReply("x", 1, ReplyKind::kError, &done), E_OUTOFMEMORY);
  EXPECT_FALSE(done);
  EXPECT_EQ(list.Kind(), ReplyKind::kNone);
}

TEST(QuorinFileListMessage, ClearsDoneUntilTheLastEntry) {
  CGetFileListCmd list(kFlags);
  bool done = true;
  EXPECT_EQ(list.ParseReply("{{A,1,0}", 8, ReplyKind::kReply, &done), S_OK);
  EXPECT_FALSE(done);
  EXPECT_EQ(list.ParseReply("{B,1,0}}", 8, ReplyKind::kReply, &done), S_OK);
  EXPECT_TRUE(done);
}

TEST(QuorinFileListMessage, IsDoneAtTheEndOfTheList) {
  CGetFileListCmd list(kFlags);
  bool done = false;
  EXPECT_EQ(list.ParseReply("}", 1, ReplyKind::kReply, &done), S_OK);
  EXPECT_TRUE(done);
}

TEST(QuorinFileListMessage, TakesOnlyTheGivenLengthOfTheBody) {
  CGetFileListCmd list(kFlags);
  bool done = false;
  list.ParseReply("{A,123,0}}", 5, ReplyKind::kReply, &done);
  ASSERT_EQ(list.Entries().size(), 1U);
  EXPECT_EQ(list.Entries()[0].size, 12U);
}

}  // namespace
