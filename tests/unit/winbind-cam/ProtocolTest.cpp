// SPDX-License-Identifier: Apache-2.0
#include <Protocol.h>

#include "../../../providers/winbind-cam/Codes.h"
#include "../../../providers/winbind/Failure.h"

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

namespace tessel::winbind::cam {
namespace {

using nlohmann::json;
using testing::HasSubstr;

/// The code of the failure that `call` ends with, 0 where it does not fail.
template <typename Call> Codes::Code CodeOf(Call call) {
    try {
        (void)call(); // what is looked at is how it fails
    } catch (Failure const& failure) {
        return failure.Code();
    }
    return 0;
}

Codes::Code DomainCode(std::string const& answer) {
    return CodeOf([&] { return ReadDomainAnswer(answer); });
}

Codes::Code AccountCode(std::string const& answer) {
    return CodeOf([&] { return ReadAccountAnswer(answer).controller; });
}

char const GoodDomain[] =
    R"({"version": 1, "netbios": "CORP", "dns": "corp.example", "sid": "S-1-5-21-1-2-3"})"
    "\n\n";

/// GoodDomain with another value for `key`.
std::string DomainWith(char const* key, json const& value) {
    json answer = json::parse(GoodDomain);
    answer[key] = value;
    return answer.dump() + "\n\n";
}

TEST(ProtocolTest, ARequestIsOneLineOfJSON) {
    EXPECT_EQ(json({{"version", 1}, {"request", "domain"}}), json::parse(DomainRequest()));
    std::string const text = AccountRequest("host-01", "Servers/\"Linux\"\n");
    EXPECT_EQ(text.size() - 1, text.find('\n'));
    EXPECT_EQ(json({{"version", 1},
                    {"request", "account"},
                    {"account", "host-01"},
                    {"unit", "Servers/\"Linux\"\n"}}),
              json::parse(text));
}

TEST(ProtocolTest, AHostThatLeavesTheUnitToTheServiceNamesNone) {
    EXPECT_FALSE(json::parse(AccountRequest("host01", nullptr)).contains("unit"));
}

TEST(ProtocolTest, ANameThatNoHostHasIsNotAskedFor) {
    for (char const* name :
         {"", "a.b", "a b", "-a", "a-", "a\n", "host$", "h\xc3\xb6st", "a/b", "a234567890123456"}) {
        EXPECT_EQ(Codes::InvalidComputerName, CodeOf([&] { return AccountRequest(name, nullptr); }))
            << name;
    }
    EXPECT_EQ(0U, CodeOf([] { return AccountRequest("a23456789012345", nullptr); }));
}

TEST(ProtocolTest, AUnitThatIsNoTextIsRefused) {
    EXPECT_EQ(Codes::InvalidParameter, CodeOf([] { return AccountRequest("a", "\xff"); }));
}

TEST(ProtocolTest, ADomainsAnswerIsRead) {
    DomainInformation const information = ReadDomainAnswer(GoodDomain);
    EXPECT_EQ("CORP", information.netBIOSName);
    EXPECT_EQ("corp.example", information.dnsName);
    EXPECT_EQ("S-1-5-21-1-2-3", information.sid);
}

TEST(ProtocolTest, NonsenseIsNoAnswer) {
    for (char const* text :
         {"", "\n\n", "x\n\n", "{}\n\n", "[]\n\n", "null\n\n", "{\"version\": 2}\n\n",
          "{\"version\": \"1\"}\n\n", "{\"version\": 1.0}\n\n", "{\"version\": 1}\n\n",
          "{\"version\": 1, \"netbios\": \"CORP\"", "[[[[[[[[\n\n", "\xff\xfe\n\n",
          "{\"version\": 1, \"error\": 3}\n\n", "{\"version\": 1, \"error\": \"other\"}\n\n"}) {
        EXPECT_EQ(Codes::InvalidAnswer, DomainCode(text)) << text;
        EXPECT_EQ(Codes::InvalidAnswer, AccountCode(text)) << text;
        EXPECT_FALSE(IsCodeSpent(text)) << text;
    }
}

TEST(ProtocolTest, ANameThatIsNoneIsNotHandedOn) {
    EXPECT_EQ(0U, DomainCode(DomainWith("dns", "a-b.example")));
    for (char const* key : {"netbios", "dns", "sid"}) {
        for (json const& value : {json(), json(1), json(""), json("a b"), json("a\nb"),
                                  json(std::string("a\0b", 3)), json(std::string(300, 'a'))}) {
            EXPECT_EQ(Codes::InvalidAnswer, DomainCode(DomainWith(key, value)))
                << key << " " << value;
        }
    }
    EXPECT_EQ(Codes::InvalidAnswer, DomainCode(DomainWith("sid", "X-1-5")));
}

TEST(ProtocolTest, AnAccountsAnswerIsRead) {
    MachineAccount const account =
        ReadAccountAnswer("{\"version\": 1, \"controller\": \"dc1.corp.example\"}\nAb+/0=\n");
    EXPECT_EQ("dc1.corp.example", account.controller);
    EXPECT_EQ("Ab+/0=", View(account.blob));
}

TEST(ProtocolTest, AnAccountWithoutABlobIsNoAnswer) {
    for (char const* blob : {"", "A b", "A\rb", "\"", "A\xff"}) {
        EXPECT_EQ(
            Codes::InvalidAnswer,
            AccountCode(std::string("{\"version\": 1, \"controller\": \"dc1\"}\n") + blob + "\n"))
            << blob;
    }
}

TEST(ProtocolTest, EachRefusalHasItsCode) {
    struct {
        char const* error;
        Codes::Code code;
    } const refusals[] = {
        {"code-refused", 5},  {"too-many-attempts", 1909}, {"account-exists", 1316},
        {"no-such-unit", 87}, {"bad-request", 87},         {"failed", 1359},
    };
    for (auto const& refusal : refusals) {
        std::string const answer =
            json({{"version", 1}, {"error", refusal.error}, {"spent", false}}).dump() + "\n\n";
        EXPECT_EQ(refusal.code, AccountCode(answer));
        EXPECT_EQ(refusal.code, DomainCode(answer));
    }
}

TEST(ProtocolTest, ACodeIsSpentWhereTheServiceSaysSo) {
    EXPECT_TRUE(IsCodeSpent("{\"version\": 1, \"controller\": \"dc1\", \"spent\": true}\nAA\n"));
    EXPECT_TRUE(IsCodeSpent("{\"version\": 1, \"error\": \"failed\", \"spent\": true}\n\n"));
    EXPECT_FALSE(IsCodeSpent("{\"version\": 1, \"error\": \"failed\", \"spent\": false}\n\n"));
    EXPECT_FALSE(IsCodeSpent("{\"version\": 1, \"error\": \"failed\", \"spent\": 1}\n\n"));
    EXPECT_FALSE(IsCodeSpent("{\"version\": 1, \"error\": \"failed\"}\n\n"));
}

TEST(ProtocolTest, AFailureDoesNotTellTheBlob) {
    try {
        (void)ReadAccountAnswer("{\"version\": 1, \"controller\": \"a b\"}\nSECRET\n");
        FAIL();
    } catch (Failure const& failure) {
        EXPECT_THAT(failure.what(), Not(HasSubstr("SECRET")));
        EXPECT_THAT(failure.what(), HasSubstr("controller"));
    }
}

} // namespace
} // namespace tessel::winbind::cam
