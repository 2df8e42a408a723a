#include "velmar/response.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>

#include "tests/velmar/velmar_replies.h"

namespace {

using namespace VelmarCommands;

ResponseType TypeOf(std::string_view bytes) { return RecogniseResponse(bytes).type; }

TEST(VelmarResponse, AnAcknowledgementEndsAfterThePrompt) {
  const Response response = RecogniseResponse(kOkPrompt);
  EXPECT_EQ(response.type, RESPONSE_OK);
  EXPECT_EQ(response.prompt_end, kOkPrompt.size());
  EXPECT_EQ(RecogniseResponse(kOkPrompt + "#LOG").prompt_end, kOkPrompt.size());
}

TEST(VelmarResponse, ARefusalWithoutTextIsAnError) {
  const Response response = RecogniseResponse(kErrorPrompt);
  EXPECT_EQ(response.type, RESPONSE_ERROR);
  EXPECT_EQ(response.prompt_end, kErrorPrompt.size());
}

// The text before the prompt is not skipped.
TEST(VelmarResponse, ARefusalWithTextIsUnknown) {
  EXPECT_EQ(TypeOf(kErrorTextPrompt), RESPONSE_UNKNOWN);
}

// Every beginning of a reply waits for more bytes; none is taken for another reply.
TEST(VelmarResponse, BeginningsAreIncomplete) {
  for (const std::string& reply : {kOkPrompt, kErrorPrompt}) {
    for (size_t length = 0; length < reply.size(); ++length) {
      const Response response = RecogniseResponse(reply.substr(0, length));
      EXPECT_EQ(response.type, RESPONSE_INCOMPLETE) << reply << length;
      EXPECT_EQ(response.prompt_end, 0u);
    }
  }
}

TEST(VelmarResponse, AnythingElseIsUnknownAtItsFirstByte) {
  for (const char* reply :
       {"x", "\rx", "\r\nx", "\r\n<OK_____", "\r\n<NO_______", "\r\n<OK\r\nx_"}) {
    EXPECT_EQ(TypeOf(reply), RESPONSE_UNKNOWN) << reply;
  }
}

// How many bytes are needed to recognise the kind of a reply.
TEST(VelmarResponse, IsTakenForUnknownOnceEnoughHasCome) {
  EXPECT_EQ(TypeOf("\r\n<OK\r\nx"), RESPONSE_UNKNOWN);
  const std::string other = "\r\n<NOTHING";
  for (size_t length = 0; length < 10; ++length) {
    EXPECT_EQ(TypeOf(other.substr(0, length)), RESPONSE_INCOMPLETE) << length;
  }
  EXPECT_EQ(TypeOf(other.substr(0, 10)), RESPONSE_UNKNOWN);
  EXPECT_EQ(TypeOf("\r\n<ERROR:x"), RESPONSE_UNKNOWN);
  EXPECT_EQ(TypeOf("\r\n<ERROR ["), RESPONSE_UNKNOWN);
}

// The reply is a part of a buffer; behind it may be the rest of an earlier one.
TEST(VelmarResponse, WhatIsBehindTheReplyIsNotRead) {
  constexpr std::string_view kBuffer = "\r\n<OK\r\n[COM1]";
  for (size_t length = 0; length < kBuffer.size(); ++length) {
    EXPECT_EQ(RecogniseResponse(kBuffer.substr(0, length)).type, RESPONSE_INCOMPLETE) << length;
  }
}

TEST(VelmarResponse, ThePromptEndsAtItsFirstBracket) {
  EXPECT_EQ(RecogniseResponse("\r\n<OK\r\n[]").prompt_end, 9u);
  EXPECT_EQ(RecogniseResponse("\r\n<OK\r\n[a[b]c]").prompt_end, 12u);
  EXPECT_EQ(RecogniseResponse("\r\n<ERROR:[\r\n\xFF]").prompt_end, 14u);
}

TEST(VelmarResponse, AZeroByteIsAnEndThatIsNotThereYet) {
  EXPECT_EQ(TypeOf(std::string("\r\n<OK\r\n\0xx", 10)), RESPONSE_INCOMPLETE);
  EXPECT_EQ(TypeOf(std::string("\r\n<OK\r\n[CO\0M]", 13)), RESPONSE_INCOMPLETE);
}

TEST(VelmarResponse, APromptWithoutEndIsIncomplete) {
  EXPECT_EQ(TypeOf("\r\n<OK\r\n[" + std::string(8000, 'C')), RESPONSE_INCOMPLETE);
}

}  // namespace
