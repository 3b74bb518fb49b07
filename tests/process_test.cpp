// Outer test: child programs under the environment keys of each case, with all that they write and
// how they end.
// - what each key does, and the order of the look-ups
// - the banner, the refusal at load, the four ERROR lines and the exit behind them
// - the end of the registry, unloading, static pools of a client
// - the process around it: locales, stream state, two threads, raised privileges
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#ifdef _WIN32
#include <windows.h>
#else
#include <sys/wait.h>
#include <unistd.h>
#endif

namespace {

const char* const on = "ZOR_VOK_MEMPOOL_ON";
const char* const alsoOn = "ZOR_MEMPOOL_ON";
const char* const trace = "ZOR_VOK_MEMPOOL_TRACE";
const char* const bucketSize = "ZOR_VOK_MEMPOOL_BUCKET_SIZE";
const char* const maxSize = "ZOR_VOK_MEMPOOL_MAX_RECORD_SIZE";
const char* const minSize = "ZOR_VOK_MEMPOOL_MIN_RECORD_SIZE";
const char* const alignment = "ZOR_VOK_MEMPOOL_DATA_ALIGNMENT";
const char* const keep = "ZOR_VOK_MEMPOOL_KEEP_EMPTY_BUCKETS";
const char* const info = "ZOR_VOK_MEMPOOL_INFO";
// In the order of reading.
const char* const allKeys[] = {on,      alsoOn,    trace, bucketSize, maxSize,
                               minSize, alignment, keep,  info};

using Env = std::vector<std::pair<const char*, const char*>>;
using Script = std::vector<std::string>;

const std::string child = VOK_MEMPOOL_CHILD;
const std::string host = VOK_MEMPOOL_HOST;
const std::string clientChild = VOK_MEMPOOL_CLIENT_CHILD;
const std::string client = VOK_MEMPOOL_CLIENT;
const std::string library = VOK_MEMPOOL_LIBRARY;
const std::string launcher = VOK_MEMPOOL_LAUNCHER;

struct Result {
  std::string command; ///< what was run, for the report of a failure
  int status = 0;
  std::string out;
  std::string err;
};

#ifdef _WIN32
constexpr bool isWindows = true;
/// The status of a process that a refusal at load ends: of its abort or, where the loader takes
/// the exception itself, the exception's code.
constexpr int refused = sizeof(void*) == 4 ? 3 : 0x20474343;

void SetKey(const char* key, const char* value) { SetEnvironmentVariableA(key, value); }

/// Runs the command with its output in two files; returns its status.
int Execute(std::string command, const std::string& out, const std::string& err) {
  const auto create = [](const std::string& path) {
    SECURITY_ATTRIBUTES inherited{sizeof inherited, nullptr, TRUE};
    return CreateFileA(path.c_str(), GENERIC_WRITE, 0, &inherited, CREATE_ALWAYS, 0, nullptr);
  };
  STARTUPINFOA start{};
  start.cb = sizeof start;
  start.dwFlags = STARTF_USESTDHANDLES;
  start.hStdOutput = create(out);
  start.hStdError = create(err);
  PROCESS_INFORMATION process{};
  CreateProcessA(nullptr, command.data(), nullptr, nullptr, TRUE, 0, nullptr, nullptr, &start,
                 &process);
  DWORD status = DWORD(-1);
  WaitForSingleObject(process.hProcess, INFINITE);
  GetExitCodeProcess(process.hProcess, &status);
  for (HANDLE handle : {start.hStdOutput, start.hStdError, process.hThread, process.hProcess})
    CloseHandle(handle);
  return static_cast<int>(status);
}
#else
constexpr bool isWindows = false;
constexpr int refused = 128 + 6;

void SetKey(const char* key, const char* value) {
  if (value != nullptr)
    setenv(key, value, 1);
  else
    unsetenv(key);
}

int Execute(const std::string& command, const std::string& out, const std::string& err) {
  const std::string call = "ulimit -c 0; exec " + command + " >" + out + " 2>" + err;
  const int status = std::system(call.c_str());
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}
#endif

/// The file's text, whose lines must end as the platform's do, with "\n" for each end.
std::string TakeFile(const std::string& path) {
  std::stringstream bytes;
  bytes << std::ifstream(path, std::ios::binary).rdbuf();
  std::filesystem::remove(path);
  std::string text = bytes.str();
  const std::size_t size = text.size();
  for (std::size_t at = 0; (at = text.find("\r\n", at)) != std::string::npos;)
    text.erase(at, 1);
  const auto numLines = static_cast<std::size_t>(std::count(text.begin(), text.end(), '\n'));
  EXPECT_EQ(size - text.size(), isWindows ? numLines : 0) << text;
  return text;
}

/// Runs the program with just these of the library's keys in its environment.
Result RunChild(const std::string& program, const Script& arguments, const Env& env = {}) {
  Result result;
  for (const char* key : allKeys)
    SetKey(key, nullptr);
  for (const auto& [key, value] : env) {
    SetKey(key, value);
    result.command += std::string(key) + "=\"" + value + "\" ";
  }
  std::string call = (VOK_MEMPOOL_EMULATED ? launcher + " \"" : "\"") + program + "\"";
  for (const std::string& argument : arguments)
    call += " \"" + argument + "\"";
  result.command += call;
  const std::string stem =
      std::string("process_test.") + testing::UnitTest::GetInstance()->current_test_info()->name();
  result.status = Execute(call, stem + ".out", stem + ".err");
  result.out = TakeFile(stem + ".out");
  std::istringstream lines(TakeFile(stem + ".err"));
  for (std::string line; std::getline(lines, line);) {
    // What the language's runtime and the emulator say of an abort is not the library's.
    if (line.rfind("terminate called", 0) == 0 || line.rfind("qemu: uncaught", 0) == 0) continue;
    result.err += line + (lines.eof() ? "" : "\n");
  }
  return result;
}

const std::string place = ":../s/MemPool:";

/// A process's text with what differs from build to build and from run to run replaced: a message's
/// source line by "#####", if it fills its field of five as it should, and the addresses of a trace
/// line by "@" and a number by first sight. A destroyed pool or freed block gives its number up.
std::string Masked(const std::string& text) {
  std::string masked;
  std::map<std::string, std::string> tokens;
  std::size_t numTokens = 0;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    if (const std::size_t found = line.find(place); found != std::string::npos) {
      const std::size_t field = found + place.size();
      const std::size_t number = line.find_first_not_of(' ', field);
      const std::size_t end = line.find_first_not_of("0123456789ABCDEF", number);
      if (end == field + 5 && number < end && line[number] != '0') line.replace(field, 5, "#####");
    }
    std::size_t at = line.rfind("zvpt:", 0) == 0 ? 7 : 0;
    for (const char lastUse : {'d', 'f'}) {
      if (at == 0) break;
      const std::size_t end = line.find_first_not_of("0123456789abcdef", at);
      const std::string address = line.substr(at, end - at);
      std::string& token = tokens[address];
      if (token.empty()) token = "@" + std::to_string(++numTokens);
      line.replace(at, address.size(), token);
      if (line[5] == lastUse) tokens.erase(address);
      at = line.find(':', at) + 1;
    }
    masked += line + (lines.eof() ? "" : "\n");
  }
  return masked;
}

/// The source lines of the messages in the text, in their order.
std::vector<int> SourceLines(const std::string& text) {
  std::vector<int> numbers;
  for (std::size_t at = 0; (at = text.find(place, at)) != std::string::npos;) {
    at += place.size();
    numbers.push_back(std::stoi(text.substr(at)));
  }
  return numbers;
}

std::string Message(const std::string& severity, const std::string& text) {
  return severity + ":../s/MemPool:#####: " + text + "\n";
}

/// All that the child wrote, masked, and its status.
void Expect(const Result& result, int status, const std::string& out) {
  EXPECT_EQ(Masked(result.out), out) << result.command;
  EXPECT_EQ(result.err, "") << result.command;
  EXPECT_EQ(result.status, status) << result.command;
}

TEST(Keys, StoreWhatTheirTestsLetPass) {
  struct Row {
    const char* values[8]; // of the keys in their order, null for one that isn't set
    const char* settings; // bucket size, alignment, maximum, minimum, keep, trace, on, off, enabled
  };
  const Row rows[] = {
      {{}, "4010 4 1000 8 0 0 0 1 0"},
      {{"1", "0", "2", "0", "32767", "4", "0", "2"}, "0 1 32767 4 1 1 1 0 1"},
      {{"0", "1", "0", "x", "32768", "3", "-8", "0"}, "0 1 1000 8 0 0 1 0 1"},
      {{"x", "-1", "-1", "-1", "-1", "0", "x", "-1"}, "4010 1 1000 8 0 0 0 1 0"},
      {{" +12x", "", "x", "2147483647", "9", "x", "65536", "x"}, "2147483647 0 9 8 0 0 1 0 1"},
      {{"-1", "0", "1", "70000", "1001", "1000", "65537", "1"}, "70000 1 1001 1000 1 1 0 1 0"},
      {{nullptr, "1", nullptr, "1", nullptr, "999", "65535"}, "1 65535 1000 999 0 0 1 0 1"},
      {{"", "2", "", "", nullptr, "", "", ""}, "0 1 1000 8 0 0 1 0 1"},
  };
  for (const Row& row : rows) {
    Env env;
    for (std::size_t i = 0; i < std::size(row.values); ++i)
      if (row.values[i] != nullptr) env.emplace_back(allKeys[i], row.values[i]);
    Expect(RunChild(child, {"settings"}, env), 0, std::string(row.settings) + "\n");
  }
}

#ifdef __GLIBC__
TEST(Keys, AreLookedUpOnceInTheirOrder) {
  std::string all;
  std::string whenOn;
  for (const char* const key : allKeys) {
    all += std::string(key) + "\n";
    if (key != alsoOn) whenOn += std::string(key) + "\n";
  }
  Expect(RunChild(child, {"lookups"}), 0, all);
  Expect(RunChild(child, {"lookups"}, {{on, "0"}}), 0, all);
  Expect(RunChild(child, {"lookups"}, {{on, "1"}}), 0, whenOn);
}

#endif

#if defined(__GLIBC__) && !VOK_MEMPOOL_EMULATED // an emulator raises none
TEST(Keys, AreNotReadUnderRaisedPrivileges) {
  const std::string raised = std::filesystem::absolute("pool_host_raised").string();
  std::filesystem::copy_file(host, raised, std::filesystem::copy_options::overwrite_existing);
  const bool made = chown(raised.c_str(), uid_t(-1), getgid() + 1) == 0;
  std::filesystem::permissions(raised, std::filesystem::perms(02755));
  const bool effective = made && RunChild(raised, {"raised"}).out == "raised\n";
  if (effective) {
    Expect(RunChild(host, {"open " + client, "close"}, {{trace, "1"}}), 0,
           "zvpt:c:@1\nzvpt:c:@2\nzvpt:d:@2\nzvpt:d:@1\n");
    Expect(RunChild(raised, {"open " + client, "close"}, {{trace, "1"}}), 0, "");
  }
  std::filesystem::remove(raised);
  if (!effective) GTEST_SKIP() << "no program with raised privileges can be made here";
}
#endif

std::string Banner(const std::vector<std::string>& values) {
  const char* const rule = "# ================================================";
  std::string text = Message("INFO", rule) + Message("INFO", "# ZOR_VOK_MEMPOOL_INFO") +
                     Message("INFO", rule) +
                     Message("INFO", "# Version            : $Id: MemPool,v 1.2.52.4 2009/08/10 "
                                     "21:28:15 qrt Exp $");
  const char* const names[] = {
      "# Bucket Size        : ", "# Data Alignment     : ", "# Keep Empty Buckets : ",
      "# Max Record Size    : ", "# Min Record Size    : ", "# Trace              : ",
      "# Use Heap           : "};
  for (std::size_t i = 0; i < values.size(); ++i)
    text += Message("INFO", names[i] + values[i]);
  return text;
}

TEST(Banner, ShowsTheOutcomeEachLineWithItsOwnSourceLine) {
  const std::string defaults = Banner({"4010", "4", "0", "1000", "8", "0", "1"});
  const Result result = RunChild(child, {"say main"}, {{info, "0"}});
  Expect(result, 0, defaults + "main\n");
  const std::vector<int> lines = SourceLines(result.out);
  EXPECT_EQ(lines.size(), 11U);
  EXPECT_EQ(std::adjacent_find(lines.begin(), lines.end(), std::greater_equal<>()), lines.end())
      << result.out;

  Expect(RunChild(child, {"say main"}, {{info, "yes"}}), 0, defaults + "main\n");
  Expect(RunChild(child, {"say main"}, {{info, "-1"}}), 0, "main\n");
  Expect(RunChild(child, {"say main"},
                  {{info, "1"},
                   {on, "1"},
                   {trace, "1"},
                   {bucketSize, "70000"},
                   {maxSize, "2000"},
                   {minSize, "16"},
                   {alignment, "65536"},
                   {keep, "1"}}),
         0, Banner({"70000", "0", "1", "2000", "16", "1", "0"}) + "main\n");
}

/// The refusal's text with its source line, which has no width, masked.
std::string Refusal(const std::string& text) {
  const std::string opening = "EXCEPTION" + place;
  const std::size_t end = text.find_first_not_of("0123456789", opening.size());
  const bool good = text.rfind(opening, 0) == 0 && end != std::string::npos && end > opening.size();
  return good ? "line" + text.substr(end) : text;
}

TEST(Refusal, AbortsTheStartOfAProgram) {
  struct Row {
    Env env;
    const char* shown;
    const char* max;
    const char* min;
  };
  const Row rows[] = {
      {{{maxSize, "0"}}, "(8>=0)", "0", "8"},
      {{{maxSize, "much"}}, "(8>=0)", "0", "8"},
      {{{minSize, "-1"}}, "(4294967295>=1000)", "1000", "4294967295"},
      {{{minSize, "1000"}}, "(1000>=1000)", "1000", "1000"},
      {{{minSize, "21"}, {maxSize, "20"}}, "(21>=20)", "20", "21"},
  };
  for (const Row& row : rows) {
    const std::string line =
        std::string("line: MIN_RECORD_SIZE >= MAX_RECORD_SIZE ") + row.shown + "\n";
    for (const bool banner : {false, true}) {
      Env env = row.env;
      if (banner) env.emplace_back(info, "1");
      const Result result = RunChild(child, {"say main"}, env);
      EXPECT_EQ(Refusal(result.err), line) << result.command;
      EXPECT_EQ(Masked(result.out),
                banner ? Banner({"4010", "4", "0", row.max, row.min, "0", "1"}) : "")
          << result.command;
      EXPECT_EQ(result.status, refused) << result.command;
    }
  }
}

const Env refusedEnv = {{minSize, "1000"}};
const char* const refusal = "line: MIN_RECORD_SIZE >= MAX_RECORD_SIZE (1000>=1000)\n";

TEST(Refusal, FailsALoadAtRunTime) {
  const Result result = RunChild(host, {"open-directly " + library}, refusedEnv);
  EXPECT_EQ(Refusal(result.err), refusal);
  const bool loaderTakesIt = isWindows && sizeof(void*) == 8;
  EXPECT_EQ(result.out, loaderTakesIt ? "error " + std::to_string(refused) + "\n" : "");
  EXPECT_EQ(result.status, loaderTakesIt ? 0 : refused);
}

#ifndef _WIN32
TEST(Refusal, IsThrownAsItsTextByALoadAtRunTime) {
  for (const Script& script : {Script{"open " + library}, {"grouping", "open " + library}}) {
    const Result result = RunChild(host, script, refusedEnv);
    EXPECT_EQ(Refusal(result.err), refusal);
    EXPECT_EQ(result.out, result.err) << result.command;
    EXPECT_EQ(result.status, 0) << result.command;
  }
}

// It is mapped, so that a second load starts nothing any more.
TEST(Refusal, LeavesALibraryThatWorksWhole) {
  const Env env = {{minSize, "16"}, {maxSize, "16"}, {on, "1"}, {trace, "1"}};
  const Result result =
      RunChild(host, {"open " + library, "open " + client, "make", "report"}, env);
  EXPECT_EQ(Masked(result.out.substr(result.err.size())),
            "zvpt:c:@1\nzvpt:c:@2\nzvpt:c:@3\nmade __VOK_MEMPOOL_00002\n3 pools, found\n"
            "zvpt:a:@3:@4:10\nzvpt:f:@3:@4:\nserved\nzvpt:d:@2\nzvpt:d:@1\n");
}
#endif

// The statements that stop a process, by the beginning of their text.
const std::string duplicate = "Duplicate Vok_MemPool::Mgr name encountered ";
const std::string tooMuch = "Cannot allocate ";
const std::string maxTooLarge =
    "Unexpected condition: the maximum record size is larger than the bucket size ";
const std::string minTooLarge =
    "Unexpected condition: the min rec size is larger than the max rec size ";
const std::string stop = Message("ERROR", tooMuch + "1073741824 bytes, the maximum is 1073741823");

TEST(FatalStop, WritesOneLineAndExitsWithOne) {
  struct Row {
    Script script;
    std::string statement;
    const char* values;
  };
  const Row rows[] = {
      {{"pool a", "pool a"}, duplicate, "'a'"},
      {{"pool ", "pool "}, duplicate, "''"},
      {{"pool a", "max 5000", "pool a"}, duplicate, "'a'"},
      {{"pool __VOK_MEMPOOL_00001", "nameless 1"}, duplicate, "'__VOK_MEMPOOL_00001'"},
      {{"pool a", "alloc 1073741824"}, tooMuch, "1073741824 bytes, the maximum is 1073741823"},
      {{"pool a", "alloc 4294967295"}, tooMuch, "4294967295 bytes, the maximum is 1073741823"},
      {{"max 5000", "pool a"}, maxTooLarge, "(5000>4006) [4010]"},
      {{"align 1", "max 4007", "pool a"}, maxTooLarge, "(4007>4006) [4010]"},
      {{"max 4294967295", "pool a"}, maxTooLarge, "(4294967292>4006) [4010]"},
      {{"bucket 70000", "max 65535", "pool a"}, maxTooLarge, "(65532>65531) [65535]"},
      {{"bucket 0", "pool a"}, maxTooLarge, "(1000>4294967292) [0]"},
      {{"bucket 3", "pool a"}, maxTooLarge, "(1000>4294967295) [3]"},
      {{"bucket 4", "pool a"}, maxTooLarge, "(1000>0) [4]"},
      {{"bucket 1003", "min 2000", "pool a"}, maxTooLarge, "(1000>999) [1003]"},
      {{"max 3", "pool a"}, minTooLarge, "(8>0)"},
      {{"min 1001", "pool a"}, minTooLarge, "(1004>1000)"},
      {{"min 4294967295", "pool a"}, minTooLarge, "(4294967296>1000)"},
      {{"align 65535", "pool a"}, minTooLarge, "(65535>0)"},
  };
  std::map<std::string, int> lines; // the source line of each statement
  for (const Row& row : rows) {
    for (const char* const pooling : {"0", "1"}) {
      Script script = row.script;
      script.push_back("say survived");
      const Result result = RunChild(child, script, {{on, pooling}});
      Expect(result, 1, Message("ERROR", row.statement + row.values));
      for (const int line : SourceLines(result.out))
        EXPECT_EQ(lines.emplace(row.statement, line).first->second, line) << result.command;
    }
  }
  EXPECT_NE(lines[duplicate], lines[tooMuch]);
  EXPECT_NE(lines[maxTooLarge], lines[minTooLarge]);
}

TEST(FatalStop, IsNotMadeByTheLastValuesThatFit) {
  const Script scripts[] = {
      {"align 1", "max 4006", "pool a", "alloc 4002", "free"},
      {"bucket 1004", "pool a", "alloc 996", "free"},
      {"min 1000", "pool a", "alloc 1", "free"},
      {"align 0", "pool a", "alloc 10", "free"},
      {"pool a", "drop", "pool a", "alloc 10", "free"},
      {"bucket 4294967295", "max 65531", "pool a", "alloc 65524", "free"},
  };
  for (const Script& script : scripts)
    for (const char* const pooling : {"0", "1"})
      Expect(RunChild(child, script, {{on, pooling}}), 0, "freed\n");
  for (const char* const pooling : {"0", "1"}) {
    const Result result = RunChild(child, {"pool a", "alloc 1073741823", "free"}, {{on, pooling}});
    EXPECT_THAT(result.out, testing::AnyOf("freed\n", "bad_alloc\nrefused\n")) << result.command;
    EXPECT_EQ(result.status, 0) << result.command;
  }
}

TEST(FatalStop, FollowsTheKeysThatTheLoadLetPass) {
  Expect(RunChild(child, {"pool a"}, {{bucketSize, "0"}}), 1,
         Message("ERROR", maxTooLarge + "(1000>4294967292) [0]"));
  Expect(RunChild(child, {"pool a"}, {{maxSize, "32767"}}), 1,
         Message("ERROR", maxTooLarge + "(32764>4006) [4010]"));
  Expect(RunChild(child, {"pool a", "alloc 10", "free"}, {{alignment, "65536"}, {on, "1"}}), 0,
         "freed\n");
}

TEST(FatalStop, RunsWhatIsQueuedForTheExit) {
  const std::string farewell = "1 pools: a\nstatic object destroyed\n";
  Expect(RunChild(child, {"await-exit", "pool a", "alloc 1073741824"}), 1, stop + farewell);
  Expect(RunChild(child, {"await-exit", "pool a", "max 3", "pool b"}, {{trace, "1"}}), 1,
         "zvpt:c:@1\nzvpt:c:@2\n" + Message("ERROR", minTooLarge + "(8>0)") + farewell);
}

TEST(Text, IsFlushedLineByLine) {
  constexpr int cut = 7;
  Expect(RunChild(child, {"cut"}, {{info, "0"}}), cut,
         Banner({"4010", "4", "0", "1000", "8", "0", "1"}));
  Expect(RunChild(child, {"pool a", "cut"}, {{trace, "1"}}), cut, "zvpt:c:@1\n");
  Expect(RunChild(child, {"cut-exit", "pool a", "alloc 1073741824"}), cut, stop);
}

TEST(Trace, TellsALifeAndComesAheadOfAnErrorLine) {
  for (const char* const pooling : {"0", "1"}) {
    Expect(RunChild(child,
                    {"pool a", "alloc 10", "alloc 0", "alloc 5000", "free", "trace 0", "free",
                     "trace 1", "free", "nameless 1", "drop", "drop"},
                    {{trace, "1"}, {on, pooling}}),
           0,
           "zvpt:c:@1\nzvpt:a:@1:@2:10\nzvpt:a:@1:@3:0\nzvpt:a:@1:@4:5000\nzvpt:f:@1:@4:\nfreed\n"
           "freed\nzvpt:f:@1:@2:\nfreed\nzvpt:c:@5\nzvpt:d:@5\nzvpt:d:@1\n");
    Expect(RunChild(child, {"max 5000", "pool a"}, {{trace, "1"}, {on, pooling}}), 1,
           "zvpt:c:@1\n" + Message("ERROR", maxTooLarge + "(5000>4006) [4010]"));
    Expect(RunChild(child, {"pool a", "pool a"}, {{trace, "1"}, {on, pooling}}), 1,
           "zvpt:c:@1\n" + Message("ERROR", duplicate + "'a'"));
    Expect(RunChild(child, {"pool a", "alloc 1073741824"}, {{trace, "1"}, {on, pooling}}), 1,
           "zvpt:c:@1\n" + stop);
  }
}

TEST(Text, KeepsTheStreamsStateAndNoOther) {
  // Numbers follow the stream; pointers and names don't.
  Expect(
      RunChild(child, {"hex", "nameless 10", "names", "trace 1", "alloc 171", "alloc 1073741824"}),
      1,
      "1 pools: __VOK_MEMPOOL_00010\nzvpt:a:@1:@2:AB\n" +
          Message("ERROR", tooMuch + "40000000 bytes, the maximum is 3FFFFFFF"));
  // The global locale has no say.
  Expect(RunChild(child,
                  {"global", "nameless 10", "names", "trace 1", "alloc 171", "alloc 1073741824"}),
         1, "1 pools: __VOK_MEMPOOL_00010\nzvpt:a:@1:@2:171\n" + stop);
  EXPECT_THAT(RunChild(child, {"hex", "pool a", "report"}).out,
              testing::HasSubstr("   Bucket Size :      FAA\n"));
  // The stream's own locale groups its numbers, the source line's among them.
  const Result imbued = RunChild(
      child, {"imbue", "nameless 10", "names", "trace 1", "alloc 171", "alloc 1073741824"});
  EXPECT_THAT(Masked(imbued.out),
              testing::StartsWith("1 pools: __VOK_MEMPOOL_00010\nzvpt:a:@1:@2:1_7_1\nERROR:"));
  EXPECT_THAT(imbued.out, testing::EndsWith(": Cannot allocate 1_0_7_3_7_4_1_8_2_4 bytes, "
                                            "the maximum is 1_0_7_3_7_4_1_8_2_3\n"));
}

TEST(Registry, IsLeftByAClientsStaticPoolsAfterMain) {
  Expect(RunChild(clientChild, {}, {{trace, "1"}, {on, "1"}}), 0,
         "zvpt:c:@1\nzvpt:c:@2\nmain begins\nzvpt:c:@3\nmade __VOK_MEMPOOL_00002\n"
         "3 pools, found\nzvpt:a:@3:@4:10\nzvpt:f:@3:@4:\nserved\nzvpt:d:@3\nmain ends\n"
         "zvpt:d:@2\nzvpt:d:@1\n");
}

TEST(Registry, IsEmptyBehindItsEndAndAPoolStillServes) {
  const std::string end = "zvpt:d:@2\nzvpt:d:@1\n";
  const std::string use = "zvpt:a:@3:@4:10\nzvpt:f:@3:@4:\nserved\nzvpt:d:@3\n";
  // On Windows a program's handlers run ahead of any library's.
  const std::string behind =
      isWindows ? "3 pools, found\n" + use + end : end + "0 pools, not found\n" + use;
  const Script script = {"await-exit", "open " + client, "make"};
  const std::string made = "zvpt:c:@1\nzvpt:c:@2\nzvpt:c:@3\nmade __VOK_MEMPOOL_00002\n";
  const Env env = {{trace, "1"}, {on, "1"}};
  Expect(RunChild(host, script, env), 0, made + behind);
  Script stopped = script;
  stopped.push_back("stop");
  Expect(RunChild(host, stopped, env), 1, made + stop + behind);
}

TEST(Registry, GoesWithTheLibraryAtItsUnloading) {
  const Script use = {"open " + client, "make", "report", "close", "loaded " + library};
  Script twice = use;
  twice.insert(twice.end(), use.begin(), use.end());
  const std::string life = "zvpt:c:@1\nzvpt:c:@2\nzvpt:c:@3\nmade __VOK_MEMPOOL_00002\n"
                           "3 pools, found\nzvpt:a:@3:@4:10\nzvpt:f:@3:@4:\nserved\n"
                           "zvpt:d:@2\nzvpt:d:@1\nnot loaded\n";
  const Result result = RunChild(host, twice, {{trace, "1"}, {on, "1"}});
  EXPECT_EQ(result.err, "");
  EXPECT_EQ(result.status, 0);
  const std::size_t half = result.out.find("not loaded\n") + 11;
  EXPECT_EQ(Masked(result.out.substr(0, half)), life);
  EXPECT_EQ(Masked(result.out.substr(std::min(half, result.out.size()))), life);
}

TEST(Exceptions, ReachTheProgram) {
  Expect(RunChild(child, {"pool a", "overfill"}), 0, "bad_alloc\n");
}

TEST(Threads, LoseNothingWithAPoolEach) {
  const char* const rounds = VOK_MEMPOOL_EMULATED ? "50000" : "1000000";
  Expect(RunChild(child, {std::string("threads ") + rounds}, {{on, "1"}}), 0, "nothing lost\n");
}

} // namespace
