// SPDX-License-Identifier: Apache-2.0
#include "host/ServiceRecords.h"

#include "Failure.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

namespace tessel::winbind {
namespace {

using ServiceRecords::Read;
using testing::ElementsAre;
using testing::IsEmpty;

std::string Number(unsigned int value) {
    return {static_cast<char>(value >> 8U), static_cast<char>(value & 0xFFU)};
}

std::string Name(std::vector<std::string> const& labels) {
    std::string name;
    for (std::string const& label : labels) {
        name += static_cast<char>(label.size()) + label;
    }
    return name + '\0';
}

constexpr unsigned int service = 33;

std::string Record(std::string const& data, unsigned int type = service) {
    return Number(0xC00C) + Number(type) + Number(1) + Number(0) + Number(60) +
           Number(static_cast<unsigned int>(data.size())) + data;
}

std::string Service(unsigned int priority, unsigned int weight, std::string const& target) {
    return Record(Number(priority) + Number(weight) + Number(389) + target);
}

std::string Message(std::vector<std::string> const& records) {
    std::string text = Number(1) + Number(0x8180) + Number(1) +
                       Number(static_cast<unsigned int>(records.size())) + Number(0) + Number(0) +
                       Name({"corp", "example"}) + Number(service) + Number(1);
    for (std::string const& record : records) {
        text += record;
    }
    return text;
}

TEST(ServiceRecordsTest, OrdersByPriorityThenWeight) {
    EXPECT_THAT(Read(Message({Service(10, 100, Name({"c"})), Service(0, 1, Name({"b"})),
                              Service(0, 5, Name({"a", "corp"}))})),
                ElementsAre("a.corp", "b", "c"));
}

TEST(ServiceRecordsTest, NamesAControllerOnce) {
    EXPECT_THAT(Read(Message({Service(0, 1, Name({"dc"})), Service(0, 1, Name({"DC"}))})),
                ElementsAre("dc"));
}

TEST(ServiceRecordsTest, FollowsACompressedName) {
    EXPECT_THAT(Read(Message({Service(0, 1,
                                      "\x03"
                                      "dc1" +
                                          Number(0xC00C))})),
                ElementsAre("dc1.corp.example"));
}

TEST(ServiceRecordsTest, PassesOverOtherRecordsAndNamesThatAreNoHosts) {
    EXPECT_THAT(Read(Message({Record(Name({"alias"}), 5), Service(0, 1, Name({"-S"})),
                              Service(0, 1, Name({"a b"})), Service(0, 1, Name({})),
                              Service(0, 1, Name({"dc"}))})),
                ElementsAre("dc"));
}

TEST(ServiceRecordsTest, SurvivesEveryCut) {
    std::string const whole = Message({Service(0, 2, Name({"dc1"})), Service(0, 1,
                                                                             "\x03"
                                                                             "dc2" +
                                                                                 Number(0xC00C))});
    for (std::size_t length = 0; length < whole.size(); ++length) {
        try {
            EXPECT_LE(Read(whole.substr(0, length)).size(), 1U) << length;
        } catch (Failure const& e) {
            EXPECT_EQ(1355U, e.Code());
        }
    }
    EXPECT_THAT(Read(whole), ElementsAre("dc1", "dc2.corp.example"));
}

TEST(ServiceRecordsTest, SurvivesANameThatRefersToItself) {
    EXPECT_THAT(Read(Message({Service(0, 1, Number(0xC02C))})), IsEmpty());
}

} // namespace
} // namespace tessel::winbind
