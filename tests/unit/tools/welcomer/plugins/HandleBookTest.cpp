// What a plug-in may do with the handles that it was given, and what not.

#include "tools/welcomer/plugins/HandleBook.h"
#include "plugins/PropertyListHandles.h"

#include <gtest/gtest.h>
#include <string>

namespace welcomer::tool {

namespace {

wl_value* newArray() {
    return delegatePluginHost().new_array();
}

class HandleBookTest : public testing::Test {
  protected:
    void expect(Misuse misuse, const std::string& text) const {
        ASSERT_EQ(book.misuses().size(), 1U);
        EXPECT_EQ(book.misuses().front().misuse, misuse);
        EXPECT_EQ(book.misuses().front().text, text);
    }

    const PropertyList response = PropertyList::Array{1, 2};
    HandleBook book;
};

TEST_F(HandleBookTest, whatIsOwnedMayBeReadChangedAndReleasedOnce) {
    wl_value* const value = newArray();
    wl_value* const handle = book.own(value, "new_array");
    EXPECT_NE(handle, value);
    EXPECT_EQ(book.read(handle, "count"), value);
    EXPECT_EQ(book.change(handle, "array_append"), value);
    EXPECT_EQ(book.owned(), 1U);
    book.release(handle);
    EXPECT_EQ(book.owned(), 0U);
    EXPECT_TRUE(book.misuses().empty());
}

TEST_F(HandleBookTest, nullIsNoMisuse) {
    EXPECT_EQ(book.own(nullptr, "copy"), nullptr);
    EXPECT_EQ(book.lend(nullptr, nullptr, "array_at"), nullptr);
    EXPECT_EQ(book.read(nullptr, "count"), nullptr);
    EXPECT_EQ(book.pass(nullptr, "array_append"), nullptr);
    book.release(nullptr);
    EXPECT_TRUE(book.misuses().empty());
}

TEST_F(HandleBookTest, aSecondReleaseIsMisuse) {
    wl_value* const handle = book.own(newArray(), "new_array");
    book.release(handle);
    book.release(handle);
    expect(Misuse::ReleasedTwice, "release is given a value that was released (it came from new_array)");
}

TEST_F(HandleBookTest, aReleaseOfWhatWasPassedOnIsMisuse) {
    wl_value* const handle = book.own(newArray(), "new_array");
    takeHandle(book.pass(handle, "array_append"));
    book.release(handle);
    expect(Misuse::ReleasedTwice, "release is given a value that was passed on (it came from new_array)");
}

TEST_F(HandleBookTest, whatWasReleasedIsStillReadAndThatIsMisuse) {
    wl_value* const value = newArray();
    wl_value* const handle = book.own(value, "new_array");
    book.release(handle);
    EXPECT_EQ(book.read(handle, "count"), value);
    expect(Misuse::UsedAfterRelease, "count is given a value that was released (it came from new_array)");
}

TEST_F(HandleBookTest, whatIsLentMayOnlyBeRead) {
    auto* const handle = const_cast<wl_value*>(book.lend(borrowedHandle(response), nullptr, "the response"));
    EXPECT_EQ(book.read(handle, "count"), borrowedHandle(response));
    EXPECT_TRUE(book.misuses().empty());
    EXPECT_EQ(book.change(handle, "array_append"), nullptr);
    expect(Misuse::ChangedBorrowed,
           "array_append changes a value that was only lent (it came from the response)");
}

TEST_F(HandleBookTest, aLoanEndsWithItsCallForWhatWasLentOfItToo) {
    const wl_value* const whole = book.lend(borrowedHandle(response), nullptr, "the response");
    const wl_value* const part = book.lend(borrowedHandle((*response.array())[0]), whole, "array_at");
    book.endLoan(whole);
    book.read(part, "value_type");
    expect(
        Misuse::UsedAfterRelease,
        "value_type is given a value that was lent of one which has changed or gone (it came from array_at)");
}

TEST_F(HandleBookTest, whatWasLentOfAContainerIsGoneWhenThatChanges) {
    wl_value* const array = book.own(newArray(), "new_array");
    const wl_value* const part = book.lend(borrowedHandle(response), array, "array_at");
    EXPECT_EQ(book.read(part, "count"), borrowedHandle(response));
    book.change(array, "array_append");
    EXPECT_EQ(book.read(part, "count"), nullptr);
    expect(Misuse::UsedAfterRelease,
           "count is given a value that was lent of one which has changed or gone (it came from array_at)");
}

TEST_F(HandleBookTest, whatTheHostNeverGaveIsMisuse) {
    int strange = 0;
    EXPECT_EQ(book.read(reinterpret_cast<const wl_value*>(&strange), "count"), nullptr);
    expect(Misuse::UsedAfterRelease, "count: the value was never the host's");
}

TEST_F(HandleBookTest, anErrorSlotIsGoodForItsCall) {
    ErrorSlot slot;
    book.open(slot.handle());
    EXPECT_TRUE(book.isOpen(slot.handle()));
    book.close(slot.handle());
    EXPECT_TRUE(book.misuses().empty());
    EXPECT_FALSE(book.isOpen(slot.handle()));
    expect(Misuse::SlotOfAnother, "raise: the error slot is not that of a running call");
}

} // namespace

} // namespace welcomer::tool
