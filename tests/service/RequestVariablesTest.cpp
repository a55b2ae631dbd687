// The request-variable protocol against the runtime stand-in.
#include "service/RequestVariables.h"

#include <gtest/gtest.h>

#include <string>

#include "webhost_runtime/Request.h"

namespace qel::service {
namespace {

std::string Read(webhost::Request& request, const char* name) {
    fnd::NString value = ReadRequestVariable(&request, name);
    return std::string(value.CStr(), value.Length());
}

TEST(RequestVariables, ShortLongAndMissingValues) {
    webhost::Request request("POST");
    std::string exactly31(31, 'a');
    std::string exactly32(32, 'b');
    std::string longer(5000, 'c');
    request.SetVariable("items", exactly31);
    request.SetVariable("loc", exactly32);
    request.SetVariable("CONTENT_TYPE", longer);
    EXPECT_EQ(Read(request, "REQUEST_METHOD"), "POST");
    EXPECT_EQ(Read(request, "items"), exactly31);
    EXPECT_EQ(Read(request, "loc"), exactly32);
    EXPECT_EQ(Read(request, "CONTENT_TYPE"), longer);
    EXPECT_EQ(Read(request, "missing"), "");
}

TEST(RequestVariables, RefusingRuntimeGivesEmptyTexts) {
    webhost::Request request("POST");
    request.SetVariable("items", std::string(100, 'x'));
    request.Fail().readRequestVariable = true;
    EXPECT_EQ(Read(request, "REQUEST_METHOD"), "");
    EXPECT_EQ(Read(request, "items"), "");
}

}  // namespace
}  // namespace qel::service
