#include "record/Session.h"

#include "common/Files.h"
#include "common/Programs.h"
#include "common/Tool.h"
#include "record/Drain.h"
#include "record/Launch.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <fmt/format.h>
#include <memory>
#include <thread>

namespace VOK::MemPool::Tools {

namespace {

/// A process that has a ring.
struct Recorded {
  std::unique_ptr<Drain> drain;
  bool isOver = false; ///< another program runs in the process

  bool HasEnded() const { return isOver || (kill(drain->GetProcess(), 0) != 0 && errno == ESRCH); }
};

/// The processes of a recording, and their files.
class Session {
public:
  Session(const RecordRequest& request_, const std::string& folder_)
      : request(request_), folder(folder_) {}

  /// One round; whether any process had something to write. New processes are looked for now and
  /// then.
  bool Take() {
    if (std::chrono::steady_clock::now() >= nextLook) Find();
    bool any = false;
    for (Recorded& one : recorded) {
      const bool hasEnded = one.HasEnded(); // so that nothing comes after what is taken now
      any |= one.drain->Take();
      if (hasEnded) End(one);
    }
    std::erase_if(recorded, [](const Recorded& one) { return one.drain == nullptr; });
    return any;
  }

  void End() {
    Find();
    for (Recorded& one : recorded)
      End(one);
    recorded.clear();
  }

  void Say() const {
    if (numFiles == 0)
      throw Failure("nothing was recorded: the loader ignored the recorder's library, or there was "
                    "no memory for its ring in " +
                    folder);
    std::string files = request.isKept ? " in " + request.file : "";
    if (request.isKept && numFiles > 1) files += " to " + PathOf(numFiles);
    fmt::print(stderr, "vokmempool: {} event{} of {} process{}{}\n", numEvents,
               numEvents == 1 ? "" : "s", numFiles, numFiles == 1 ? "" : "es", files);
    if (numLost > 0) fmt::print(stderr, "vokmempool: at least {} events were lost\n", numLost);
  }

private:
  std::string PathOf(unsigned number) const {
    return number == 1 ? request.file : fmt::format("{}.{}", request.file, number);
  }

  /// New rings, in the order of their time, which their names hold.
  void Find() {
    nextLook = std::chrono::steady_clock::now() + std::chrono::milliseconds(2);
    std::vector<std::filesystem::path> paths;
    for (const auto& entry : std::filesystem::directory_iterator(folder))
      if (entry.path().extension() == Record::ringSuffix) paths.push_back(entry.path());
    std::ranges::sort(paths, {}, [](const auto& path) { return path.stem().extension().string(); });
    for (const auto& path : paths) {
      auto drain = std::make_unique<Drain>(path, PathOf(++numFiles), request.depth);
      const int process = drain->GetProcess();
      for (Recorded& earlier : recorded)
        earlier.isOver |= earlier.drain->GetProcess() == process;
      recorded.push_back({std::move(drain)});
    }
  }

  void End(Recorded& one) {
    one.drain->End();
    numEvents += one.drain->GetNumEvents();
    numLost += one.drain->GetNumLost();
    one.drain = nullptr;
  }

  const RecordRequest& request;
  const std::string folder;
  std::vector<Recorded> recorded;
  std::chrono::steady_clock::time_point nextLook{};
  unsigned numFiles = 0;
  std::uint64_t numEvents = 0, numLost = 0;
};

/// Runs the program to the end of all its processes, or of the recorder, and returns its status.
int Run(const std::string& program, const RecordRequest& request, const std::string& folder,
        Session& session) {
  Launch processes(program, request.program, folder, request.depth);
  while (processes.IsRunning() && !Launch::IsEndAsked())
    if (!session.Take()) std::this_thread::sleep_for(std::chrono::microseconds(500));
  return processes.GetStatus();
}

} // namespace

int RecordProgram(const RecordRequest& request) {
  const std::string program = FindProgram(request.program.front());
  WriteFile(request.file, {}); // fails before the program starts
  const TemporaryFolder folder;
  Session session(request, folder.GetPath());
  const int status = Run(program, request, folder.GetPath(), session);
  session.End();
  session.Say();
  return status;
}

} // namespace VOK::MemPool::Tools
