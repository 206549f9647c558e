#include "linux/KilledProcess.h"

#include <csignal>
#include <poll.h>
#include <stdexcept>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>
#include <utility>

namespace mirabel {

void KilledProcess::Self::say(std::string_view line) const {
  const std::string whole = std::string(line) + "\n";
  if (::write(out_, whole.data(), whole.size()) != static_cast<ssize_t>(whole.size())) ::_exit(1);
}

void KilledProcess::Self::wait() const {
  char byte = 0;
  if (::read(in_, &byte, 1) != 1) ::_exit(1);
}

KilledProcess::KilledProcess(const std::function<void(const Self&)>& work) {
  int out[2];
  int in[2];
  if (::pipe(out) != 0 || ::pipe(in) != 0) throw std::runtime_error("no pipe");
  process_ = ::fork();
  if (process_ < 0) throw std::runtime_error("no process");
  if (process_ == 0) {
    ::close(out[0]);
    ::close(in[1]);
    const Self self(out[1], in[0]);
    work(self);
    ::close(out[1]);
    self.wait();
    ::_exit(1);
  }
  ::close(out[1]);
  ::close(in[0]);
  out_ = out[0];
  in_ = in[1];
}

bool KilledProcess::readMore() {
  char buffer[4096];
  const ssize_t count = ::read(out_, buffer, sizeof buffer);
  if (count <= 0) return false;
  said_.append(buffer, static_cast<std::size_t>(count));
  return true;
}

std::string KilledProcess::line() {
  while (said_.find('\n') == std::string::npos) {
    if (!readMore()) return {};
  }
  std::string line = said_.substr(0, said_.find('\n'));
  said_.erase(0, line.size() + 1);
  return line;
}

void KilledProcess::goOn() const {
  if (::write(in_, "g", 1) != 1) throw std::runtime_error("the process is gone");
}

bool KilledProcess::listen(long microseconds) {
  pollfd poll{out_, POLLIN, 0};
  const timespec time{microseconds / 1'000'000, microseconds % 1'000'000 * 1000};
  return ::ppoll(&poll, 1, &time, nullptr) == 1 && readMore();
}

std::vector<std::string> KilledProcess::kill() {
  if (process_ < 0) return {};
  ::kill(process_, SIGKILL);
  ::waitpid(std::exchange(process_, -1), nullptr, 0);
  while (readMore()) {
  }
  ::close(out_);
  ::close(in_);
  std::vector<std::string> lines;
  while (said_.find('\n') != std::string::npos)
    lines.push_back(line());
  return lines;
}

}  // namespace mirabel
