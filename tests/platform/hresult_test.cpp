#include "platform/hresult.h"

#include <gtest/gtest.h>

#include <new>
#include <stdexcept>

using rcvlink::CatchResult;
using rcvlink::HResultError;
using rcvlink::HResultFromError;
using rcvlink::ThrowIfFailed;

namespace {

TEST(HResult, IsMadeOfAWin32Error) {
  EXPECT_EQ(HResultFromError(ERROR_FILE_NOT_FOUND), static_cast<HRESULT>(0x80070002));
  EXPECT_EQ(HResultFromError(0x12345), static_cast<HRESULT>(0x80072345)) << "16 bits of it";
}

// 0 is success, and a negative number is already a result.
TEST(HResult, LeavesZeroAndNegativesAlone) {
  EXPECT_EQ(HResultFromError(0), S_OK);
  EXPECT_EQ(HResultFromError(0xE0001009), static_cast<HRESULT>(0xE0001009));
}

TEST(CatchResult, GivesWhatTheOperationGivesOrRaises) {
  EXPECT_EQ(CatchResult([] { return S_FALSE; }), S_FALSE);
  EXPECT_EQ(CatchResult([]() -> HRESULT { throw HResultError(E_ACCESSDENIED); }), E_ACCESSDENIED);
  EXPECT_EQ(CatchResult([]() -> HRESULT { throw std::bad_alloc(); }), E_OUTOFMEMORY);
}

TEST(CatchResult, LetsNoExceptionThrough) {
  EXPECT_EQ(CatchResult([]() -> HRESULT { throw std::length_error("too long"); }), E_UNEXPECTED);
}

TEST(ThrowIfFailed, LetsSuccessesPass) {
  EXPECT_NO_THROW(ThrowIfFailed(S_FALSE));
  EXPECT_THROW(ThrowIfFailed(E_FAIL), HResultError);
}

}  // namespace
