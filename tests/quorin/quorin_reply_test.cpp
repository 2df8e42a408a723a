// How a command collects its reply from the connection.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/quorin/reply_fixture.h"

using rcvlink::KernelHandle;
using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using namespace QuorinCommands;
using testing::ElementsAre;

namespace {

using QuorinReply = QuorinReplyTest;

TEST_F(QuorinReply, KeepsTheBodyWithoutTheTag) {
  receiver.Reply("ask\r\n", "/dev/ser/a");
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "/dev/ser/a");
  EXPECT_EQ(command.Kind(), ReplyKind::kReply);
  EXPECT_EQ(command.Result(), S_OK);
}

TEST_F(QuorinReply, KeepsTheWholeBodyOfAnUntaggedCommand) {
  Answer({"RE005%1%ab"});
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "%1%ab");
}

TEST_F(QuorinReply, MayBeEmpty) {
  receiver.Reply("ask\r\n", "");
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "");
  EXPECT_EQ(command.Kind(), ReplyKind::kReply);
}

TEST_F(QuorinReply, OfTheErrorKindIsARefusal) {
  receiver.Reply("ask\r\n", "{4,wrong}", "ER");
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(command.Result(), kNotConnected);
  EXPECT_EQ(command.Kind(), ReplyKind::kError);
  EXPECT_EQ(command.ReplyText(), "{4,wrong}");
}

TEST_F(QuorinReply, OfTheBlankKindIsASuccess) {
  receiver.Reply("ask\r\n", "text", "  ");
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
  EXPECT_EQ(command.ReplyText(), "text");
}

TEST_F(QuorinReply, OfASecondExecuteReplacesTheFirst) {
  receiver.Reply("ask\r\n", "one");
  AskCommand command(kTagged);
  command.Execute(&connection, nullptr);
  receiver.Reply("ask\r\n", "another");
  command.Execute(&connection, nullptr);
  EXPECT_EQ(command.ReplyText(), "another");
}

TEST_F(QuorinReply, HasTheLongestLength) {
  const std::string body(4000, 'x');
  receiver.Reply("ask\r\n", body);
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), body);

  const std::string longest(4095, 'x');
  Answer({"REFFF" + longest});
  AskCommand untagged(0);
  EXPECT_EQ(untagged.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(untagged.ReplyText(), longest);
}

// What may come before a reply.
class QuorinReplyAfter : public QuorinReply, public testing::WithParamInterface<std::string> {};

TEST_P(QuorinReplyAfter, IsTheSameHoweverItIsCut) {
  const size_t whole = GetParam().size() + Message("RE", "%999999%body").size();
  for (size_t cut = 1; cut < whole; ++cut) {
    AnswerWithTag([&](const std::string& tag) {
      const std::string bytes = GetParam() + Message("RE", tag + "body") + "\r\n";
      return std::vector<std::string>{bytes.substr(0, std::min(cut, bytes.size() - 1)),
                                      bytes.substr(std::min(cut, bytes.size() - 1))};
    });
    AskCommand command(kTagged);
    EXPECT_EQ(command.Execute(&connection, nullptr), S_OK) << "cut at " << cut;
    EXPECT_EQ(command.ReplyText(), "body") << "cut at " << cut;
    EXPECT_EQ(command.Kind(), ReplyKind::kReply) << "cut at " << cut;
    while (connection.AnswersLeft() != 0) {
      char byte = 0;
      DWORD count = 0;
      connection.Read(&byte, 1, &count, 0);
    }
  }
}

TEST_P(QuorinReplyAfter, MayComeByteByByte) {
  AnswerWithTag([&](const std::string& tag) {
    std::vector<std::string> reads;
    for (const char byte : GetParam() + Message("RE", tag + "body")) reads.emplace_back(1, byte);
    return reads;
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "body");
  EXPECT_EQ(connection.AnswersLeft(), 0U);
}

INSTANTIATE_TEST_SUITE_P(Garbage,
                         QuorinReplyAfter,
                         testing::Values("",
                                         "\r\n",
                                         "*$\xFF\x01",
                                         "R",
                                         "E",
                                         " ",
                                         "RE",
                                         "ER",
                                         "  ",
                                         "   ",
                                         "RE1",
                                         "RE1 ",
                                         "RExyz",
                                         "  xyz",
                                         "RE1000",
                                         "RERRER",
                                         "RE003ABC!",
                                         "print,/cur/term\r\n"));

INSTANTIATE_TEST_SUITE_P(OtherMessages,
                         QuorinReplyAfter,
                         testing::Values("RE003%0%\r\n",
                                         "RE00A%0%another",
                                         "ER003%0%",
                                         "  003%0%",
                                         "RE001%",
                                         "RE000\r\n",
                                         "RE003%0%RE003%0%"));

TEST_F(QuorinReply, TakesWhatFollowsADamagedHeader) {
  AnswerWithTag([](const std::string& tag) {
    std::string damaged = Message("RE", tag + "lost");
    damaged[2] = '?';
    return std::vector<std::string>{damaged + Message("RE", tag + "good")};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "good");
}

TEST_F(QuorinReply, TakesTheFirstOfTwoMessagesInARow) {
  AnswerWithTag([](const std::string& tag) {
    return std::vector<std::string>{Message("RE", tag + "one") + Message("RE", tag + "two")};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "one");
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReply, IsFoundAfterAnotherTagInTheSameRead) {
  AnswerWithTag([](const std::string& tag) {
    return std::vector<std::string>{Message("RE", "%0%other") + Message("RE", tag + "mine")};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "mine");
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReply, IsFoundAfterAnotherTagInAnEarlierRead) {
  AnswerWithTag([](const std::string& tag) {
    return std::vector<std::string>{Message("RE", "%0%other"), Message("RE", tag + "mine")};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "mine");
}

TEST_F(QuorinReply, IsNotThatOfATagThatBeginsAlike) {
  AnswerWithTag([](const std::string& tag) {
    const std::string longer = tag.substr(0, tag.size() - 1) + "0%";
    return std::vector<std::string>{Message("ER", longer + "other"), Message("RE", tag + "mine")};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "mine");
}

TEST_F(QuorinReply, IsSearchedForInsideTheMessageOfAnotherTag) {
  AnswerWithTag([](const std::string& tag) {
    return std::vector<std::string>{Message("RE", "%0%" + Message("RE", tag + "mine"))};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "mine");
}

TEST_F(QuorinReply, IsNotTakenBeforeItIsWhole) {
  AnswerWithTag([](const std::string& tag) {
    const std::string message = Message("RE", tag + "0123456789");
    return std::vector<std::string>{message.substr(0, message.size() - 1)};
  });
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Result(), kTimedOut);
  EXPECT_EQ(command.GetReply(), nullptr);
  EXPECT_EQ(command.Kind(), ReplyKind::kNone);
}

TEST_F(QuorinReply, LeavesTheCodeOfAFailedReadInTheResult) {
  for (const HRESULT failure : {kTimedOut, E_HANDLE, S_FALSE}) {
    connection.GiveResult(failure);
    AskCommand command(0);
    EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
    EXPECT_EQ(command.Result(), failure);
    EXPECT_EQ(command.Kind(), ReplyKind::kNone);
  }
}

TEST_F(QuorinReply, DoesNotTakeBytesOfAFailedRead) {
  connection.Give({S_FALSE, "RE001x", {}});
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Result(), S_FALSE);
  EXPECT_EQ(command.GetReply(), nullptr);
}

TEST_F(QuorinReply, IsEmptyAndOfTheBlankKindWhenAReadGivesNothing) {
  connection.GiveRead("");
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
  EXPECT_EQ(command.Result(), S_OK);
  EXPECT_EQ(command.GetReplyLength(), 1U);
  EXPECT_STREQ(command.ReplyText().c_str(), "");
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReply, IsEmptyWhenALaterReadGivesNothing) {
  Answer({"RE00", ""});
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
}

TEST_F(QuorinReply, EndsWithACancelBetweenTwoReads) {
  AskCommand command(0);
  connection.Give({S_OK, "RE010", [&] { command.Cancel(); }});
  connection.GiveRead("more");
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReply, EndsWithAnEventSignalledBetweenTwoReads) {
  const KernelHandle event(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  AskCommand command(0);
  connection.Give({S_OK, "RE010", [&] { SetEvent(event.get()); }});
  EXPECT_EQ(command.Execute(&connection, event.get()), S_FALSE);
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReply, IsTakenThoughACancelCameDuringItsRead) {
  AskCommand command(0);
  connection.Give({S_OK, "RE001x", [&] { command.Cancel(); }});
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "x");
}

// A command that expects several messages, or that runs out of memory.
class PatientCommand : public AskCommand {
 public:
  explicit PatientCommand(size_t wanted) : AskCommand(kTagged), wanted_(wanted) {}

  std::vector<std::string> bodies;

  HRESULT ParseReply(const char* body, uint32_t length, ReplyKind, bool* done) override {
    bodies.emplace_back(body, length);
    *done = bodies.size() == wanted_;
    return static_cast<HRESULT>(bodies.size());
  }

 private:
  size_t wanted_;
};

TEST_F(QuorinReply, GoesOnUntilTheCommandHasAllItsMessages) {
  AnswerWithTag([](const std::string& tag) {
    return std::vector<std::string>{Message("RE", tag + "1") + "\r\n" + Message("RE", tag + "2"),
                                    Message("RE", tag + "3") + Message("RE", tag + "4")};
  });
  PatientCommand command(3);
  EXPECT_EQ(command.Execute(&connection, nullptr), 3);
  EXPECT_THAT(command.bodies, ElementsAre("1", "2", "3"));
  EXPECT_EQ(Reads(), 2U);
}

TEST_F(QuorinReply, DoesNotSearchInsideAMessageThatWasTaken) {
  AnswerWithTag([](const std::string& tag) {
    return std::vector<std::string>{Message("RE", tag + Message("RE", tag + "inner")),
                                    Message("RE", tag + "next")};
  });
  PatientCommand command(2);
  command.Execute(&connection, nullptr);
  ASSERT_EQ(command.bodies.size(), 2U);
  EXPECT_EQ(command.bodies[1], "next");
}

class ForgetfulCommand : public AskCommand {
 public:
  ForgetfulCommand() : AskCommand(0) {}
  HRESULT AppendReply(const void*, uint32_t) override { return E_OUTOFMEMORY; }
};

TEST(QuorinParseReply, KeepsKindAndDoneAsTheyWereWhenItCannotKeepTheBody) {
  ForgetfulCommand command;
  bool done = false;
  EXPECT_EQ(command.ParseReply("x", 1, ReplyKind::kReply, &done), E_OUTOFMEMORY);
  EXPECT_FALSE(done);
  EXPECT_EQ(command.Kind(), ReplyKind::kNone);
}

TEST(QuorinParseReply, JoinsTheBodies) {
  AskCommand command(0);
  bool done = false;
  command.ParseReply("one", 3, ReplyKind::kReply, &done);
  command.ParseReply("two", 3, ReplyKind::kBlank, &done);
  EXPECT_TRUE(done);
  EXPECT_EQ(command.ReplyText(), "onetwo");
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
}

TEST(QuorinParseReply, SucceedsForTheBlankAndTheReplyKindOnly) {
  const auto result_of = [](ReplyKind kind) {
    AskCommand command(0);
    bool done = false;
    const HRESULT result = command.ParseReply("x", 1, kind, &done);
    EXPECT_EQ(command.Result(), result);
    EXPECT_EQ(command.Kind(), kind);
    EXPECT_TRUE(done);
    return result;
  };
  EXPECT_EQ(result_of(ReplyKind::kBlank), S_OK);
  EXPECT_EQ(result_of(ReplyKind::kReply), S_OK);
  EXPECT_EQ(result_of(ReplyKind::kError), kNotConnected);
  EXPECT_EQ(result_of(ReplyKind::kNone), kNotConnected);
}

}  // namespace
