// A program run as a child process by a test, with its standard output and error captured
// line by line, for running evwatch and camsim as a user would.
//
// Threads: two reader threads collect the output; every other call comes from the test's
// thread. The destructor kills (SIGKILL) and reaps a child that is still running.

#ifndef EVWATCH_TESTS_APPS_CHILDPROCESS_H_
#define EVWATCH_TESTS_APPS_CHILDPROCESS_H_

#include <sys/types.h>

#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

namespace evtest {

class ChildProcess {
 public:
  // Starts `argv[0]` with the arguments. Check Started().
  explicit ChildProcess(const std::vector<std::string>& argv);
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;
  ~ChildProcess();

  bool Started() const { return pid_ > 0; }
  void Signal(int signal);

  // Waits for the child to end; its exit status (128 + signal when killed by one), or
  // nullopt when the deadline passes first. Once it has ended, all output has been read.
  std::optional<int> Wait(std::chrono::milliseconds deadline);

  std::vector<std::string> Out() const;
  std::vector<std::string> Err() const;
  // Waits until pred holds for the lines of standard output read so far; false when the
  // deadline passes first.
  bool WaitForOut(const std::function<bool(const std::vector<std::string>&)>& pred,
                  std::chrono::milliseconds deadline);
  // The same for standard error.
  bool WaitForErr(const std::function<bool(const std::vector<std::string>&)>& pred,
                  std::chrono::milliseconds deadline);

 private:
  void Read(int fd, std::vector<std::string>* lines);

  pid_t pid_ = -1;
  std::optional<int> status_;  // set once reaped
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::string> out_;  // guarded by mutex_
  std::vector<std::string> err_;  // guarded by mutex_
  std::thread out_reader_;
  std::thread err_reader_;
};

// Runs a program to its end (with a generous deadline) and gives its status and output.
struct Completed {
  int status = -1;  // -1 when it did not end in time
  std::vector<std::string> out;
  std::vector<std::string> err;
};
Completed RunToEnd(const std::vector<std::string>& argv,
                   std::chrono::milliseconds deadline = std::chrono::seconds(60));

}  // namespace evtest

#endif  // EVWATCH_TESTS_APPS_CHILDPROCESS_H_
