// The command that reads a file: FILETRANSFER logs.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/support/guarded_bytes.h"
#include "tests/support/manual_clock.h"
#include "tests/support/scripted_connection.h"
#include "tests/velmar/velmar_replies.h"
#include "velmar/commands.h"

namespace {

using namespace VelmarCommands;
using testing::ElementsAre;

struct Chunks : CReadFileCmdCallback {
  HRESULT OnDataReceived(void* context) override {
    EXPECT_EQ(context, this);
    chunks.emplace_back(command->GetData(), command->GetData() + command->GetDataSize());
    return chunks.size() == fail_at ? E_ACCESSDENIED : S_OK;
  }
  const CReadFileCmd* command = nullptr;
  std::vector<std::string> chunks;
  size_t fail_at = 0;
};

class FileTransfer : public testing::Test {
 protected:
  FileTransfer() { chunks.command = &command; }

  HRESULT Transfer(const std::vector<std::string>& reads) { return Transfer(command, reads); }
  HRESULT Transfer(CReadFileCmd& read, const std::vector<std::string>& reads) {
    for (const std::string& bytes : reads) connection.GiveRead(bytes);
    return read.Execute(&connection, nullptr);
  }

  ManualClock clock;
  ScriptedConnection connection;
  Chunks chunks;
  CReadFileCmd command{&chunks, &chunks};
};

TEST_F(FileTransfer, ChunksArriveInOrderWhateverThePieces) {
  const std::string reply = kOkPrompt + BinaryLog{std::string(1024, 'a'), 2}.Bytes() +
                            BinaryLog{std::string(1024, 'b'), 1}.Bytes() +
                            BinaryLog{"the end", 0}.Bytes();
  for (const size_t piece : {size_t{1}, size_t{13}, size_t{100}, size_t{1072}, reply.size()}) {
    ScriptedConnection pieces;
    for (size_t i = 0; i < reply.size(); i += piece) pieces.GiveRead(reply.substr(i, piece));
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(read.Response(), RESPONSE_DATA);
    EXPECT_THAT(got.chunks, ElementsAre(std::string(1024, 'a'), std::string(1024, 'b'), "the end"));
    EXPECT_EQ(read.GetReplyLength(), 0u);  // a streamed reply is not stored
  }
}

TEST_F(FileTransfer, MessageLengthsOutsideTheirRangeMeanAFullChunk) {
  for (const int length : {0, 4, 7, 1033, 2000}) {
    ScriptedConnection once;
    once.GiveRead(kOkPrompt + BinaryLog{std::string(3000, 'x'), 0, length}.Bytes());
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&once, nullptr), S_OK);
    ASSERT_EQ(got.chunks.size(), 1u) << length;
    EXPECT_EQ(got.chunks[0].size(), 1024u) << length;
  }
}

TEST_F(FileTransfer, MessageLengthsInTheirRangeGiveTheChunk) {
  for (const int length : {8, 9, 1031, 1032}) {
    ScriptedConnection once;
    once.GiveRead(kOkPrompt + BinaryLog{std::string(3000, 'x'), 0, length}.Bytes());
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&once, nullptr), S_OK);
    ASSERT_EQ(got.chunks.size(), 1u) << length;
    EXPECT_EQ(got.chunks[0].size(), static_cast<size_t>(length) - 8) << length;
  }
}

// Whatever the lengths are, the exchange ends and nothing outside the buffer is used.
TEST_F(FileTransfer, WrongLengthsEndTheTransfer) {
  for (const uint8_t header : std::vector<uint8_t>{0, 1, 28, 255}) {
    for (const int length : {0, 8, 1032, 9000, 65535}) {
      for (const uint16_t sequence : std::vector<uint16_t>{0, 1, 65535}) {
        ScriptedConnection liar;
        std::string reply = kOkPrompt;
        for (int i = 0; i < 12; ++i) {
          reply += BinaryLog{std::string(1024, 'x'), sequence, length, header}.Bytes();
        }
        liar.GiveRead(reply);
        Chunks got;
        CReadFileCmd read(&got, &got);
        got.command = &read;
        EXPECT_EQ(read.Execute(&liar, nullptr), S_OK);
        for (const std::string& chunk : got.chunks) EXPECT_LE(chunk.size(), 1024u);
      }
    }
  }
}

TEST_F(FileTransfer, ChunksArriveWhereverTheReplyIsCut) {
  const std::string reply = kOkPrompt + BinaryLog{"first chunk", 2}.Bytes() +
                            BinaryLog{"second", 1}.Bytes() + BinaryLog{"the end", 0}.Bytes();
  for (size_t cut = 1; cut < reply.size(); ++cut) {
    ScriptedConnection pieces;
    pieces.GiveRead(reply.substr(0, cut));
    pieces.GiveRead(reply.substr(cut));
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(read.Response(), RESPONSE_DATA) << cut;
    EXPECT_THAT(got.chunks, ElementsAre("first chunk", "second", "the end")) << cut;
    EXPECT_EQ(pieces.AnswersLeft(), 0u);
  }
}

TEST_F(FileTransfer, AFileManyTimesTheBufferPassesThrough) {
  std::string reply = kOkPrompt;
  std::vector<std::string> expected;
  for (int i = 99; i >= 0; --i) {
    expected.push_back(std::string(1000, static_cast<char>(i + ' ')));
    reply += BinaryLog{expected.back(), static_cast<uint16_t>(i)}.Bytes();
  }
  EXPECT_EQ(Transfer({reply}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_TRUE(chunks.chunks == expected);
}

// Only the first of the three sync bytes is checked, and only before the first chunk; the checksum
// never.
TEST_F(FileTransfer, SyncBytesAndChecksumsAreNotChecked) {
  std::string first = BinaryLog{"one..", 2}.Bytes();
  first[1] = 'x';
  first[2] = 'y';
  std::string second = BinaryLog{"two..", 1}.Bytes();
  second[0] = 'x';
  EXPECT_EQ(Transfer({kOkPrompt + first + second + BinaryLog{"three", 0}.Bytes()}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_THAT(chunks.chunks, ElementsAre("one..", "two..", "three"));
}

TEST_F(FileTransfer, OtherBytesThanALogAfterThePromptEndIt) {
  EXPECT_EQ(Transfer({kOkPrompt + "x" + BinaryLog{"chunk", 0}.Bytes()}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_TRUE(chunks.chunks.empty());
}

TEST_F(FileTransfer, ARefusalEndsIt) {
  EXPECT_EQ(Transfer({kErrorPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_ERROR);
  EXPECT_EQ(connection.calls.size(), 3u);
  EXPECT_TRUE(chunks.chunks.empty());
}

// A log is consumed by its own lengths, whatever was used of it.
TEST_F(FileTransfer, LongMessagesAreCutAndSkipped) {
  const std::string longer(1992, 'a');
  EXPECT_EQ(Transfer({kOkPrompt + BinaryLog{longer, 1}.Bytes() + BinaryLog{"the end", 0}.Bytes()}),
            S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_THAT(chunks.chunks, ElementsAre(std::string(1024, 'a'), "the end"));
}

TEST_F(FileTransfer, AMessageLargerThanTheBufferEndsIt) {
  EXPECT_EQ(Transfer({kOkPrompt + BinaryLog{std::string(20000, 'a'), 1}.Bytes()}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_TRUE(chunks.chunks.empty());
  EXPECT_GT(connection.AnswersLeft(), 0u);
}

// The length of the header decides where the next log begins, not where the body begins.
TEST_F(FileTransfer, LongHeadersMoveTheNextLogOnly) {
  const std::string log = BinaryLog{"first chunk", 1, -1, 32}.Bytes() + "four";
  EXPECT_EQ(Transfer({kOkPrompt + log + BinaryLog{"the end", 0}.Bytes()}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_THAT(chunks.chunks, ElementsAre("first chunk", "the end"));
}

// An empty chunk is delivered when enough bytes have arrived after it.
TEST_F(FileTransfer, AChunkMayBeEmpty) {
  EXPECT_EQ(Transfer({kOkPrompt + BinaryLog{"", 1}.Bytes() + BinaryLog{"data", 0}.Bytes()}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_THAT(chunks.chunks, ElementsAre("", "data"));
}

// Nothing after the received bytes is read, whatever the lengths say.
TEST_F(FileTransfer, NothingIsReadBeyondWhatCame) {
  for (const uint8_t header : std::vector<uint8_t>{0, 28, 255}) {
    for (const int length : {0, 7, 8, 50, 1032, 1033}) {
      const std::string log = BinaryLog{std::string(1400, 'x'), 1, length, header}.Bytes();
      const int usual = length < 8 || length > 1032 ? 1024 : length - 8;
      for (size_t size = 0; size < log.size(); ++size) {
        const GuardedBytes guarded(std::string_view(log).substr(0, size));
        CReadFileCmd read(nullptr, nullptr);
        bool done = true;
        uint32_t consumed = 0;
        const HRESULT result = read.ParseBinaryLog(
            guarded.View().data(), static_cast<uint32_t>(size), &done, &consumed);
        // The log with the length that it says, and 36 bytes with a body of 8 bytes and the chunk
        // after them.
        const size_t needed = std::max<size_t>(static_cast<size_t>(length) + 4 + header,
                                               36 + static_cast<size_t>(std::max(8, usual)));
        ASSERT_EQ(result, size < needed ? S_FALSE : S_OK) << header << " " << length << " " << size;
        ASSERT_EQ(consumed, size < needed ? 0u : static_cast<uint32_t>(length) + 4 + header);
        ASSERT_EQ(read.GetDataSize(), size < needed ? 0u : static_cast<uint32_t>(usual));
        ASSERT_FALSE(done);
      }
    }
  }
}

TEST_F(FileTransfer, BeforeTheFirstChunkThereIsNone) {
  EXPECT_EQ(command.GetData(), nullptr);
  EXPECT_EQ(command.GetDataSize(), 0u);
}

TEST_F(FileTransfer, AFailingHostEndsIt) {
  chunks.fail_at = 2;
  const std::string chunk = BinaryLog{"data", 1}.Bytes();
  EXPECT_EQ(Transfer({kOkPrompt + chunk + chunk + chunk}), E_ACCESSDENIED);
  EXPECT_EQ(chunks.chunks.size(), 2u);
  EXPECT_EQ(clock.paused, 0u);
}

TEST_F(FileTransfer, WithoutACallbackTheLastChunkStays) {
  CReadFileCmd read(nullptr, nullptr);
  EXPECT_EQ(
      Transfer(read, {kOkPrompt + BinaryLog{"abcd", 1}.Bytes() + BinaryLog{"efghi", 0}.Bytes()}),
      S_OK);
  EXPECT_EQ(std::string(read.GetData(), read.GetData() + read.GetDataSize()), "efghi");
}

// With its checksum such a chunk is shorter than the 8 bytes that the parser needs.
TEST_F(FileTransfer, ALastChunkOfLessThanFourBytesIsNotDelivered) {
  EXPECT_EQ(Transfer({kOkPrompt + BinaryLog{"data", 1}.Bytes() + BinaryLog{"abc", 0}.Bytes()}),
            S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_THAT(chunks.chunks, ElementsAre("data"));
}

// Any success code goes on.
TEST_F(FileTransfer, AHostResultThatIsNoFailureGoesOn) {
  struct Content : Chunks {
    HRESULT OnDataReceived(void* context) override {
      Chunks::OnDataReceived(context);
      return S_FALSE;
    }
  } content;
  CReadFileCmd read(&content, &content);
  content.command = &read;
  EXPECT_EQ(
      Transfer(read, {kOkPrompt + BinaryLog{"data", 1}.Bytes() + BinaryLog{"more", 0}.Bytes()}),
      S_OK);
  EXPECT_EQ(read.Response(), RESPONSE_DATA);
  EXPECT_THAT(content.chunks, ElementsAre("data", "more"));
}

TEST_F(FileTransfer, ALogThatWasNotAcknowledgedIsIgnored) {
  EXPECT_EQ(Transfer({BinaryLog{"data", 0}.Bytes()}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_TRUE(chunks.chunks.empty());
}

TEST_F(FileTransfer, ASequenceThatNeverEndsTimesOut) {
  const std::string chunk = BinaryLog{"data", 5}.Bytes();
  EXPECT_EQ(Transfer({kOkPrompt + chunk, chunk}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(chunks.chunks.size(), 2u);
}

}  // namespace
