// The TCP bus: one connection per participant to a hub speaking the
// socketcand raw-mode protocol; the hub hands every frame to the other
// participants on the same bus name. Interface names are "host:port/bus"
// ("[::1]:29536/bench1" for IPv6; the port may be left out).
#include <fcntl.h>
#include <netdb.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <mutex>

#include "platform/can/CanDrivers.h"
#include "platform/can/SocketcandProtocol.h"

namespace faultbox {

namespace {

constexpr int kHandshakeMilliseconds = 5000;

struct Address {
  std::string host;
  std::string port;
  std::string bus;
};

bool ParseAddress(const std::string& text, Address* out) {
  const std::size_t slash = text.rfind('/');
  if (slash == std::string::npos) return false;
  Address a;
  a.bus = text.substr(slash + 1);
  std::string hostPort = text.substr(0, slash);
  if (!hostPort.empty() && hostPort[0] == '[') {
    const std::size_t close = hostPort.find(']');
    if (close == std::string::npos) return false;
    a.host = hostPort.substr(1, close - 1);
    const std::string rest = hostPort.substr(close + 1);
    if (!rest.empty() && (rest[0] != ':' || rest.size() == 1)) return false;
    a.port = rest.empty() ? "" : rest.substr(1);
  } else {
    const std::size_t colon = hostPort.rfind(':');
    a.host = hostPort.substr(0, colon);
    a.port = colon == std::string::npos ? "" : hostPort.substr(colon + 1);
    if (colon != std::string::npos && a.port.empty()) return false;
  }
  if (a.port.empty()) a.port = std::to_string(kCanHubDefaultPort);
  if (a.host.empty() || a.port.size() > 5 || a.port.find_first_not_of("0123456789") != std::string::npos)
    return false;
  const int port = std::stoi(a.port);
  if (port < 1 || port > 65535 || !IsValidSocketcandBusName(a.bus)) return false;
  *out = a;
  return true;
}

int RemainingMs(std::chrono::steady_clock::time_point deadline) {
  auto left =
      std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
  return left.count() < 0 ? 0 : static_cast<int>(left.count());
}

// A connected socket (blocking) or -1 with a text.
int Connect(const Address& a, std::chrono::steady_clock::time_point deadline, std::string* error) {
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  addrinfo* list = nullptr;
  if (int rc = ::getaddrinfo(a.host.c_str(), a.port.c_str(), &hints, &list); rc != 0) {
    *error = "cannot resolve " + a.host + ": " + ::gai_strerror(rc);
    return -1;
  }
  int fd = -1;
  *error = "no address for " + a.host;
  for (addrinfo* ai = list; ai != nullptr && fd < 0; ai = ai->ai_next) {
    fd = ::socket(ai->ai_family, ai->ai_socktype | SOCK_CLOEXEC | SOCK_NONBLOCK, ai->ai_protocol);
    if (fd < 0) {
      *error = CanSystemError("socket");
      continue;
    }
    int rc = ::connect(fd, ai->ai_addr, ai->ai_addrlen);
    if (rc != 0 && errno == EINPROGRESS) {
      pollfd p{fd, POLLOUT, 0};
      rc = ::poll(&p, 1, RemainingMs(deadline));
      int soError = 0;
      socklen_t len = sizeof soError;
      if (rc == 1 && ::getsockopt(fd, SOL_SOCKET, SO_ERROR, &soError, &len) == 0 && soError == 0) {
        rc = 0;
      } else {
        errno = rc == 0 ? ETIMEDOUT : (soError != 0 ? soError : errno);
        rc = -1;
      }
    }
    if (rc != 0) {
      *error = "cannot reach the hub at " + a.host + ":" + a.port + ": " + std::strerror(errno);
      ::close(fd);
      fd = -1;
    }
  }
  ::freeaddrinfo(list);
  if (fd >= 0) {
    ::fcntl(fd, F_SETFL, ::fcntl(fd, F_GETFL) & ~O_NONBLOCK);
    const int one = 1;
    // Answers are single small frames that someone waits for.
    ::setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &one, sizeof one);
  }
  return fd;
}

bool SendAll(int fd, const std::string& text) {
  std::size_t done = 0;
  while (done < text.size()) {
    const ssize_t n = ::send(fd, text.data() + done, text.size() - done, MSG_NOSIGNAL);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    done += static_cast<std::size_t>(n);
  }
  return true;
}

class TcpChannel final : public CanDriverChannel {
 public:
  TcpChannel(Address address, int fd, int stopFd, SocketcandParser parser, std::shared_ptr<CanFrameSink> sink)
      : address_(std::move(address)), sink_(std::move(sink)), reader_(fd, stopFd) {
    reader_.Start([this, p = std::move(parser)]() mutable { ReadLoop(std::move(p)); });
  }

  ~TcpChannel() override { reader_.Stop(); }

  CanResult Transmit(const CanFrameRecord& frame, std::string* error) override {
    if (frame.frameType != kCanFrameData) {
      *error = "the TCP bus carries data frames only";
      return CanResult::kNotSupported;
    }
    if (lost_) {
      *error = "the connection to the hub was lost";
      return CanResult::kBusError;
    }
    std::lock_guard lock(sendMutex_);
    if (!SendAll(reader_.Fd(), FormatSocketcandSend(frame))) {
      lost_ = true;
      *error = CanSystemError("send");
      return CanResult::kBusError;
    }
    return CanResult::kOk;
  }

  std::string TraceName() const override { return address_.bus; }

 private:
  void ReadLoop(SocketcandParser parser) {
    Drain(parser);
    char buf[4096];
    for (;;) {
      const CanReaderThread::Wake wake = reader_.WaitReadable();
      if (wake == CanReaderThread::Wake::kStopped) return;
      if (wake == CanReaderThread::Wake::kFailed) break;
      const ssize_t n = ::recv(reader_.Fd(), buf, sizeof buf, 0);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) break;
      parser.Feed(std::string_view(buf, static_cast<std::size_t>(n)));
      Drain(parser);
    }
    lost_ = true;
  }

  // Frames go to the sink; acknowledgements, errors and malformed elements of
  // the hub change nothing for the bus.
  void Drain(SocketcandParser& parser) {
    SocketcandElement element;
    std::string error;
    for (;;) {
      const auto status = parser.Next(&element, &error);
      if (status == SocketcandParser::Status::kNeedMore) return;
      if (status != SocketcandParser::Status::kElement || !element.Is("frame")) continue;
      CanFrameRecord frame;
      if (ParseSocketcandFrame(element, &frame, &error)) sink_->Deliver(frame);
    }
  }

  Address address_;
  std::shared_ptr<CanFrameSink> sink_;
  std::mutex sendMutex_;
  std::atomic<bool> lost_{false};
  CanReaderThread reader_;
};

// Reads elements until one with the command `want`; an error element or the
// end of the time fails.
bool Expect(int fd, SocketcandParser& parser, const char* want,
            std::chrono::steady_clock::time_point deadline, std::string* error) {
  SocketcandElement element;
  std::string parseError;
  char buf[1024];
  for (;;) {
    for (;;) {
      const auto status = parser.Next(&element, &parseError);
      if (status == SocketcandParser::Status::kNeedMore) break;
      if (status != SocketcandParser::Status::kElement) continue;
      if (element.Is(want)) return true;
      if (element.Is("error")) {
        *error = "the hub refused:";
        for (std::size_t i = 1; i < element.words.size(); ++i) *error += " " + element.words[i];
        return false;
      }
    }
    pollfd p{fd, POLLIN, 0};
    const int rc = ::poll(&p, 1, RemainingMs(deadline));
    if (rc == 0) {
      *error = std::string("the hub did not answer (waiting for \"") + want + "\")";
      return false;
    }
    if (rc < 0) {
      if (errno == EINTR) continue;
      *error = CanSystemError("poll");
      return false;
    }
    const ssize_t n = ::recv(fd, buf, sizeof buf, 0);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) {
      *error = "the hub closed the connection";
      return false;
    }
    parser.Feed(std::string_view(buf, static_cast<std::size_t>(n)));
  }
}

class TcpBusDriver final : public CanDriver {
 public:
  bool IsAvailable(const std::string& interfaceName) override {
    Address a;
    return ParseAddress(interfaceName, &a);
  }

  std::unique_ptr<CanDriverChannel> Open(const std::string& interfaceName, std::shared_ptr<CanFrameSink> sink,
                                         CanResult* result, std::string* error) override {
    Address a;
    if (!ParseAddress(interfaceName, &a) || !sink) {
      *result = CanResult::kInvalidParameter;
      *error = "\"" + interfaceName + "\" is not host:port/bus";
      return nullptr;
    }
    *result = CanResult::kNoChannel;
    const auto deadline =
        std::chrono::steady_clock::now() + std::chrono::milliseconds(kHandshakeMilliseconds);
    const int fd = Connect(a, deadline, error);
    if (fd < 0) return nullptr;
    SocketcandParser parser;
    auto send = [&](const std::string& text) {
      if (SendAll(fd, text)) return true;
      *error = CanSystemError("send");
      return false;
    };
    const bool ok = Expect(fd, parser, "hi", deadline, error) && send("< open " + a.bus + " >") &&
                    Expect(fd, parser, "ok", deadline, error) && send("< rawmode >") &&
                    Expect(fd, parser, "ok", deadline, error);
    const int stopFd = ok ? ::eventfd(0, EFD_CLOEXEC) : -1;
    if (!ok || stopFd < 0) {
      if (ok) *error = CanSystemError("eventfd");
      ::close(fd);
      return nullptr;
    }
    *result = CanResult::kOk;
    return std::make_unique<TcpChannel>(a, fd, stopFd, std::move(parser), std::move(sink));
  }
};

}  // namespace

std::shared_ptr<CanDriver> MakeTcpBusDriver() {
  return std::make_shared<TcpBusDriver>();
}

}  // namespace faultbox
