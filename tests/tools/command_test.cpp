// The program as its users start it.
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

using testing::HasSubstr;
using testing::StartsWith;

namespace {

struct Result {
  int status;
  std::string output; ///< both streams
};

/// Runs a shell command in which "vokmempool" is the program.
Result Shell(const std::string& command) {
  const std::string function = "set -o pipefail; vokmempool() { " VOK_MEMPOOL_LAUNCHER
                               " " VOK_MEMPOOL_PROGRAM " \"$@\"; }; { " +
                               command + "\n} 2>&1";
  const std::string file = testing::TempDir() + "vokmempool." + std::to_string(getpid());
  std::ofstream(file) << function;
  std::FILE* const pipe = popen(("bash " + file).c_str(), "r");
  Result result{0, ""};
  for (int c = std::fgetc(pipe); c != EOF; c = std::fgetc(pipe))
    result.output += static_cast<char>(c);
  const int status = pclose(pipe);
  result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  std::filesystem::remove(file);
  return result;
}

const std::string golden = VOK_MEMPOOL_GOLDEN "/report/demo-64.txt";

TEST(Command, ReportForms) {
  EXPECT_THAT(Shell("vokmempool report " + golden).output, HasSubstr("demo"));
  EXPECT_EQ(Shell("vokmempool report --check - < " + golden).status, 0);
  EXPECT_EQ(Shell("vokmempool report --json < " + golden +
                  " | vokmempool report --from-json --text | cmp - " + golden)
                .output,
            "");
  const Result damaged =
      Shell("sed 's/   508$/   509/' " + golden + " | vokmempool report --check");
  EXPECT_EQ(damaged.status, 1);
  EXPECT_THAT(damaged.output, HasSubstr("line 10: Used Recs is 509, not 508"));
  EXPECT_THAT(damaged.output, HasSubstr("vokmempool: -: 1 breach\n"));
  const Result cut = Shell("head -8 " + golden + " | vokmempool report");
  EXPECT_EQ(cut.status, 1);
  EXPECT_EQ(cut.output,
            "vokmempool: -: line 9: expected \"      Full     : \", found the end of the "
            "text\n");
}

TEST(Command, Trace) {
  const std::string text = "printf 'zvpt:c:a0\\nzvpt:a:a0:1000:24\\nzvpt:a:a0:2000:9' | ";
  EXPECT_THAT(Shell(text + "vokmempool trace").output, HasSubstr("line 2: 24 bytes at 1000 of a0"));
  EXPECT_THAT(Shell(text + "vokmempool trace --json").output,
              HasSubstr("\"mixedLines\":[{\"line\":3,\"text\":\"zvpt:a:a0:2000:9\"}]"));
  EXPECT_THAT(Shell(text + "ZOR_VOK_MEMPOOL_TRACE=1 vokmempool trace --at 2 --name a0=cache "
                           "--bucket-size 2000 | vokmempool report")
                  .output,
              HasSubstr("cache          1         70 "));
  EXPECT_EQ(Shell(text + "vokmempool trace --at 4").output,
            "vokmempool: -: it has no line 4, only 3\n");
}

// The page itself is looked at in a browser, by picture_test.py.
TEST(Command, Picture) {
  const std::string detailed = VOK_MEMPOOL_GOLDEN "/report/detailed-64.txt";
  EXPECT_THAT(Shell("vokmempool picture - -o - < " + detailed).output,
              StartsWith("<!DOCTYPE html>\n"));
  const std::string out = testing::TempDir() + "vokmempool.html." + std::to_string(getpid());
  const auto picture = [&](const std::string& report) {
    return Shell(report + " | vokmempool picture - -o " + out + "; echo $?").output;
  };
  const std::string isPlain = "vokmempool: -: line 1: a plain report, which has no records to draw";
  EXPECT_EQ(picture("cat " + golden), isPlain + "; DbgDetailed writes them\n1\n");
  EXPECT_EQ(picture("sed 99q " + detailed),
            "vokmempool: -: line 100: expected an empty line, found the end of the text\n1\n");
  EXPECT_FALSE(std::filesystem::exists(out));
  EXPECT_EQ(picture("cat " + golden + " " + detailed), isPlain + "\n0\n");
  std::filesystem::remove(out);
}

// Two seconds without a byte, and what comes then is late.
TEST(Command, ProgressOnATerminal) {
  const std::string slow = "{ sleep 2.1; echo zvpt:c:a0; } | ";
  const std::string bar = "\r0 MB read\x1b[K";
  EXPECT_THAT(Shell("script -qec '" + slow + VOK_MEMPOOL_PROGRAM " trace' /dev/null").output,
              testing::AllOf(StartsWith(bar), HasSubstr("\r\x1b[K")));
  EXPECT_THAT(Shell(slow + "vokmempool trace").output, testing::Not(HasSubstr(bar)));
}

TEST(Command, Ends) {
  const struct {
    const char* command;
    int status;
    const char* output;
  } cases[] = {
      {"vokmempool", 2, "vokmempool: A subcommand is required"},
      {"vokmempool report --no-such", 2, "vokmempool: "},
      {"vokmempool report --json --check", 2, "vokmempool: "},
      {"vokmempool trace --bucket-size 9", 2, "vokmempool: "},
      {"vokmempool trace --at 0", 2, "vokmempool: "},
      {"vokmempool trace --name cache", 2, "vokmempool: "},
      {"vokmempool picture report.txt", 2, "vokmempool: "},
      {"vokmempool picture -o page.html", 2, "vokmempool: "},
      {"vokmempool picture /no/such -o page.html", 1, "vokmempool: /no/such: can't be opened: "},
      {"vokmempool report /no/such", 1, "vokmempool: /no/such: can't be opened: No such file"},
      {"vokmempool report /", 1, "vokmempool: /: can't be read: Is a directory"},
      {"vokmempool report < /dev/null", 1, "vokmempool: -: there is no report in it\n"},
      {"vokmempool trace < /dev/null", 1, "vokmempool: -: there is no trace line in it\n"},
      {"echo '{' | vokmempool report --from-json", 1, "vokmempool: -: not a document of reports"},
      {"vokmempool --help", 0, ""},
  };
  for (const auto& c : cases) {
    const Result result = Shell(c.command);
    EXPECT_EQ(result.status, c.status) << c.command;
    EXPECT_THAT(result.output, StartsWith(c.output)) << c.command;
  }
  for (const char* const command : {"report", "picture", "trace"})
    EXPECT_THAT(Shell("vokmempool " + std::string(command) + " --help").output,
                HasSubstr("Example: "));
}

// A reader that has enough, also where the parent ignores the signal; a full disk is a failure.
TEST(Command, ClosedOutput) {
  const std::string much = testing::TempDir() + "vokmempool.much." + std::to_string(getpid());
  for (int i = 0; i < 400; ++i)
    std::ofstream(much, std::ios::app) << std::ifstream(golden).rdbuf();
  for (const char* const trap : {"", "trap '' PIPE; "})
    EXPECT_EQ(Shell(trap + ("{ vokmempool report --text " + much + "; } | head -1")).output,
              "MemPool::Mgr demo\n");
  std::filesystem::remove(much);
  EXPECT_THAT(Shell("vokmempool report --text " + golden + " > /dev/full").output,
              HasSubstr("vokmempool: standard output: can't be written"));
}

} // namespace
