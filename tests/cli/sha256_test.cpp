#include "sha256.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

// The examples of the standard that defines it.
TEST(Sha256Test, GivesKnownValues) {
  EXPECT_EQ(Sha256().Finish(), "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855");
  Sha256 whole;
  whole.Add("abc", 3);
  EXPECT_EQ(whole.Finish(), "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
  Sha256 pieces;
  pieces.Add("abcdbcdecdefdefgefghfghighij", 28);
  pieces.Add("hijkijkljklmklmnlmnomnopnopq", 28);
  EXPECT_EQ(pieces.Finish(), "248d6a61d20638b8e5c026930c3e6039a33ce45964ff2167f6ecedd419db06c1");
}

}  // namespace
}  // namespace cli
