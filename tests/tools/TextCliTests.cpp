// Runs the kxacore program itself: the text verbs' output and exit status.
#include <gtest/gtest.h>

#include "tests/Files/Text/KXCTextTestSupport.h"
#include "tests/tools/KXACliRun.h"

namespace {

TEST(TextCliTest, DecodeWritesTheDecodedFileByteExact) {
  const KXCScratchFile file("cli-ansel.txt", "\xE2" "e\r\n\xA1\xCF");
  for (const std::string encoding : {"ansel", "1537", "ANSEL"}) {
    const KXACliRun run = runKxacore({"text", "decode", file.path().string(), "--encoding", encoding});
    EXPECT_EQ(run.status, 0) << encoding;
    EXPECT_EQ(run.output, kxcUTF8({'e', 0x301, '\r', '\n', 0x141, 0xDF})) << encoding;
  }
  const KXACliRun json = runKxacore({"text", "decode", file.path().string(), "--encoding", "ansel", "--json"});
  EXPECT_EQ(json.output, "{\"file\":\"" + file.path().string() +
                             "\",\"encoding\":\"ansel\",\"number\":1537,\"bytes\":6,\"text\":\"e\xCC\x81\\r\\n" +
                             kxcUTF8({0x141, 0xDF}) + "\"}\n");
}

TEST(TextCliTest, ErrorsSayWhatWasWrong) {
  const KXCScratchFile file("cli-bad.txt", "ok\n\x81");
  struct ErrorCase {
    std::vector<std::string> arguments;
    std::string message;
  };
  const ErrorCase cases[] = {
      {{"text", "decode", file.path().string(), "--encoding", "cp1252"},
       "kxacore: " + file.path().string() + ": bytes do not decode as windows-1252 (first invalid sequence at byte offset 3)\n"},
      {{"text", "decode", file.path().string(), "--encoding", "klingon"},
       "kxacore: unknown encoding: klingon (see: kxacore text encodings)\n"},
      {{"text", "decode", "/nonexistent/x.txt", "--encoding", "utf-8"}, "kxacore: cannot read /nonexistent/x.txt\n"},
      {{"text", "lines", file.path().string(), "--encoding", "ascii", "--stream"},
       "kxacore: " + file.path().string() + ": line 2 does not decode as ascii\n"},
  };
  for (const ErrorCase& c : cases) {
    const KXACliRun run = runKxacore(c.arguments, true);
    EXPECT_EQ(run.status, 1) << c.message;
    EXPECT_EQ(run.output, c.message);
  }
}

TEST(TextCliTest, LinesWholeAndStreamed) {
  const KXCScratchFile file("cli-lines.txt", "one\r\ntwo\rthree\n");
  // Whole-file reading splits at the lone CR too; streaming keeps it in the line.
  EXPECT_EQ(runKxacore({"text", "lines", file.path().string()}).output, "one\ntwo\nthree\n");
  EXPECT_EQ(runKxacore({"text", "lines", file.path().string(), "--stream"}).output, "one\ntwo\rthree\n");
  EXPECT_EQ(runKxacore({"text", "lines", file.path().string(), "--json"}).output,
            "{\"line\":1,\"text\":\"one\"}\n{\"line\":2,\"text\":\"two\"}\n{\"line\":3,\"text\":\"three\"}\n");
}

TEST(TextCliTest, LinesNamesTheFallbackEncoding) {
  const KXCScratchFile file("cli-fallback.txt", "\xC6gir\n");
  const KXACliRun run = runKxacore({"text", "lines", file.path().string(), "--encoding", "utf-8"}, true);
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output, "kxacore: " + file.path().string() + " does not decode as utf-8; read as windows-1252\n");
}

TEST(TextCliTest, EncodingsListsTrialOrderWithANSELLast) {
  const KXACliRun run = runKxacore("text encodings --json");
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.output.rfind("{\"number\":1,\"name\":\"ascii\",\"tried\":true}\n"
                             "{\"number\":4,\"name\":\"utf-8\",\"tried\":true}\n", 0), 0u) << run.output;
  const std::string tail =
      "{\"number\":5,\"name\":\"iso-8859-1\",\"tried\":true}\n{\"number\":1537,\"name\":\"ansel\",\"tried\":false}\n";
  ASSERT_GE(run.output.size(), tail.size());
  EXPECT_EQ(run.output.substr(run.output.size() - tail.size()), tail);
}

}  // namespace
