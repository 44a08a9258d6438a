#include "plr/ipc/result.h"

#include <gtest/gtest.h>

#include "plr/ipc/values.h"

namespace {

using plr::Result;

template <class Expected, class Reading>
void expectThrow(const Reading& reading, const char* text) {
    try {
        static_cast<void>(reading());
        ADD_FAILURE() << "no " << text;
    } catch (const Expected& thrown) {
        EXPECT_STREQ(thrown.what(), text);
    }
}

TEST(Result, ThrowsWhenReadAsWhatItIsNot) {
    Result<int> result;
    constexpr const char* kEmpty =
        "ResultIsEmptyError: the result was never set with a success or error value";
    expectThrow<plr::ResultIsEmptyError>([&] { return result.value(); }, kEmpty);
    expectThrow<plr::ResultIsEmptyError>([&] { return result.error(); }, kEmpty);
    result.setValue(7);
    expectThrow<plr::ResultIsNotError>(
        [&] { return result.error(); },
        "ResultIsNotError: cannot return an error unless it was an error");
    result.setError(vox::error(3, "no network"));
    expectThrow<plr::ResultIsError>(
        [&] { return result.value(); },
        "ResultIsError: cannot return a result because the operation was an error");
    EXPECT_EQ(result.error(), vox::error(3, "no network"));
    EXPECT_EQ(result.valueOr(9), 9);
    result.reset();
    EXPECT_FALSE(result.isSet());
}

TEST(Result, TellsAnErrorOfTheValuesTypeFromAValue) {
    const Result<std::string, std::string> value("text");
    const auto error = Result<std::string, std::string>::failure("text");
    EXPECT_TRUE(value.isSet() && value && !value.isError());
    EXPECT_TRUE(error.isSet() && !error && error.isError());
    EXPECT_EQ(value.value(), error.error());
}

TEST(Result, MovesWhatCannotBeCopied) {
    Result<std::unique_ptr<int>, std::unique_ptr<int>> result(std::make_unique<int>(5));
    const std::unique_ptr<int> value = std::move(result).value();
    EXPECT_EQ(*value, 5);
    result.setError(std::make_unique<int>(6));
    auto moved = std::move(result);
    EXPECT_EQ(*std::move(moved).error(), 6);
}

}  // namespace
