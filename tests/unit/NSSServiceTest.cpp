// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/NSSService.h>

#include <gtest/gtest.h>

#include <list>
#include <sstream>
#include <string>
#include <type_traits>

using namespace SystemConfiguration;

namespace {

NSSService Service(std::string const& module, std::list<std::string> const& parameters) {
    NSSService service(module);
    service.parameters() = parameters;
    return service;
}

std::string Print(NSSService const& service) {
    std::ostringstream out;
    out << service;
    return out.str();
}

TEST(NSSServiceTest, NewServiceHasNoParameters) {
    NSSService const service("files");
    EXPECT_EQ(service.module(), "files");
    EXPECT_TRUE(service.parameters().empty());
}

TEST(NSSServiceTest, PlainServicePrintsItsModule) {
    EXPECT_EQ(Print(NSSService("files")), "files");
}

TEST(NSSServiceTest, ParametersPrintInBracketsWithSingleSpaces) {
    EXPECT_EQ(Print(Service("files", {"NOTFOUND=return"})), "files [NOTFOUND=return]");
    EXPECT_EQ(Print(Service("files", {"NOTFOUND=return", "UNAVAIL=continue"})),
              "files [NOTFOUND=return UNAVAIL=continue]");
}

TEST(NSSServiceTest, ServicesCompareModuleAndParametersInOrder) {
    EXPECT_TRUE(Service("a", {"x", "y"}) == Service("a", {"x", "y"}));
    EXPECT_FALSE(Service("a", {"x", "y"}) != Service("a", {"x", "y"}));
    EXPECT_TRUE(Service("a", {"x", "y"}) != Service("a", {"y", "x"}));
    EXPECT_TRUE(Service("a", {"x"}) != Service("a", {}));
    EXPECT_TRUE(Service("a", {}) != Service("b", {}));
}

TEST(NSSServiceTest, MovingAServiceCannotThrow) {
    static_assert(std::is_nothrow_move_constructible<NSSService>::value, "");
    static_assert(std::is_nothrow_move_assignable<NSSService>::value, "");
    auto service = Service("a", {"x"});
    NSSService const moved = std::move(service);
    EXPECT_EQ(moved, Service("a", {"x"}));
}

} // namespace
