// The body of a request as it is read.

#include "backends/desktop/accountserver/RequestBody.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

namespace welcomer::desktop {
namespace {

using accountserver::ContentType;

// Reads a body into one place, as libcurl does.
struct Reader {
    explicit Reader(std::size_t room) : place(room, '-') {}

    std::string readAll(RequestBody& body) {
        std::string all;
        while (const std::size_t count = body.read(place.data(), place.size())) {
            pieces.push_back(count);
            all.append(place, 0, count);
        }
        return all;
    }

    std::string place;
    std::vector<std::size_t> pieces;
};

class RequestBodyTest : public testing::TestWithParam<std::size_t> {
  protected:
    static constexpr char kBefore[] = "{\"password\":\"";
    const std::string password = "Tr0ub4dor \" and 3";
    const std::string after = "\",\"user\":\"anna\"}";
};

TEST_P(RequestBodyTest, WhateverRoomThereIsTheBodyIsWholeAndTheSameAgain) {
    RequestBody body({kBefore, after}, password, ContentType::JSON);
    Reader reader(GetParam());
    const std::string all = reader.readAll(body);
    EXPECT_EQ(all.size(), body.size());
    EXPECT_EQ(all.substr(0, all.find_last_not_of(' ') + 1),
              std::string(kBefore) + "Tr0ub4dor \\\" and 3" + after);
    body.rewind();
    EXPECT_EQ(reader.readAll(body), all);
}

TEST_P(RequestBodyTest, NothingOfThePasswordIsLeftWhereItWasReadInto) {
    RequestBody body({kBefore, after}, password, ContentType::JSON);
    Reader reader(GetParam());
    reader.readAll(body);
    for (std::size_t i = 0; i + 3 <= password.size(); ++i) {
        EXPECT_EQ(reader.place.find(password.substr(i, 3)), std::string::npos) << reader.place;
    }
}

INSTANTIATE_TEST_SUITE_P(Rooms, RequestBodyTest, testing::Values(10, 64, 511, 512, 513, 65536));

TEST(RequestBody, TheLengthsOfItsPiecesSayLittleAboutThePasswords) {
    for (const std::size_t size : {0U, 1U, 8U, 100U}) {
        const std::string password(size, 'x');
        RequestBody body({"{", std::string(300, 'y')}, password, ContentType::JSON);
        Reader reader(65536);
        reader.readAll(body);
        EXPECT_EQ(reader.pieces, (std::vector<std::size_t>{512, 512}));
    }
}

} // namespace
} // namespace welcomer::desktop
