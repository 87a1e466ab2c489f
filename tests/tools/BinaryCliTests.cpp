// Runs the kxacore program itself: the binary verbs' output and exit status.
#include <gtest/gtest.h>

#include <string>

#include "tests/tools/KXACliRun.h"

namespace {

struct CliCase {
  const char* arguments;
  int status;
  const char* output;  // stdout, or stderr when status is not 0
};

class BinaryCliTest : public testing::TestWithParam<CliCase> {};

TEST_P(BinaryCliTest, PrintsOrFails) {
  const CliCase& c = GetParam();
  const KXACliRun run = runKxacore(c.arguments, c.status != 0);
  EXPECT_EQ(run.status, c.status) << c.arguments;
  if (c.status == 0) {
    EXPECT_EQ(run.output, c.output) << c.arguments;
  } else {
    EXPECT_NE(run.output.find(c.output), std::string::npos) << c.arguments << ": " << run.output;
  }
}

INSTANTIATE_TEST_SUITE_P(
    Verbs, BinaryCliTest,
    testing::Values(
        CliCase{"binary encode int7:128", 0, "80 01\n"},
        CliCase{"binary encode int7:-1 int7:4294967295", 0, "FF FF FF FF 0F FF FF FF FF 0F\n"},
        CliCase{"binary encode string:", 0, "00\n"},
        CliCase{"binary encode 'string:a:b c' byte:255 byte:-1", 0, "05 61 3A 62 20 63 FF FF\n"},
        CliCase{"binary encode single:1.5 uint32:1 hex:0aFF", 0,
                "00 00 C0 3F 01 00 00 00 0A FF\n"},
        CliCase{"binary encode --json 'string:\xC3\xA9'", 0, "{\"hex\":\"02 C3 A9\",\"length\":3}\n"},
        CliCase{"binary decode '80 01' int7", 0, "128\n"},
        CliCase{"binary decode '02C3A900FFFFFFFFFF FEFF' string string string int16", 0,
                "\xC3\xA9\n\n(none)\n-2\n"},
        CliCase{"binary decode --json '00 FF FF FF FF FF 0000C03F 01000000' string string single "
                "uint32",
                0, "[\"\",null,1.5,1]\n"},
        CliCase{"binary decode 'FE FF FF FF' uint16 int16 uint32", 1, "at byte offset 4"},
        CliCase{"binary decode 80 int7", 1, "reading int7 at byte offset 0 runs past the end"},
        CliCase{"binary decode 0541 string", 1, "at byte offset 0"},
        CliCase{"binary decode 801 byte", 2, "odd number of hex digits"},
        CliCase{"binary decode 8x byte", 2, "not a hex digit"},
        CliCase{"binary decode 80 float", 2, "unknown type"},
        CliCase{"binary encode int7:4294967296", 2, "not an integer"},
        CliCase{"binary encode byte:256", 2, "not an integer"},
        CliCase{"binary encode single:abc", 2, "not a number"},
        CliCase{"binary encode double:1", 2, "unknown type"},
        CliCase{"binary encode 12", 2, "expected TYPE:VALUE"}));

}  // namespace
