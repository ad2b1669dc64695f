// Linux kernel CAN: one raw CAN socket per participant on an interface such
// as can0 or vcan0. The kernel hands every frame sent on a socket to the
// other sockets of the interface, so several participants of one machine see
// each other as they would on a real bus. The administrator sets the bit
// rate ("ip link set can0 type can bitrate 125000"); it is read back over
// rtnetlink and never changed here.
#include <linux/can.h>
#include <linux/can/netlink.h>
#include <linux/can/raw.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>

#include "platform/Text.h"
#include "platform/can/CanDrivers.h"

namespace faultbox {

namespace {

constexpr int kArphrdCan = 280;  // the interface type of CAN interfaces in /sys/class/net/*/type
constexpr int kNetlinkMilliseconds = 1000;

bool IsInterfaceName(const std::string& name) {
  return !name.empty() && name.size() < IFNAMSIZ && name != "." && name != ".." &&
         name.find('/') == std::string::npos && std::none_of(name.begin(), name.end(), IsBlank);
}

std::string ReadSysValue(const std::string& name, const char* file) {
  std::ifstream in("/sys/class/net/" + name + "/" + file);
  std::string value;
  std::getline(in, value);
  return Trim(value);
}

bool IsCanInterface(const std::string& name) {
  return IsInterfaceName(name) && ReadSysValue(name, "type") == std::to_string(kArphrdCan);
}

bool IsUp(const std::string& name) {
  const std::string flags = ReadSysValue(name, "flags");
  try {
    return (std::stoul(flags, nullptr, 16) & IFF_UP) != 0;
  } catch (...) {
    return true;  // cannot tell: let the socket find out
  }
}

// can2 before can10.
bool NaturalLess(const std::string& a, const std::string& b) {
  auto split = [](const std::string& s) {
    std::size_t i = s.size();
    while (i > 0 && s[i - 1] >= '0' && s[i - 1] <= '9') --i;
    const std::string digits = s.substr(i);
    return std::make_pair(s.substr(0, i), digits.empty() || digits.size() > 9 ? -1L : std::stol(digits));
  };
  auto [ha, na] = split(a);
  auto [hb, nb] = split(b);
  if (ha != hb) return ha < hb;
  if (na != nb) return na < nb;
  return a < b;
}

// ---- rtnetlink: the kind of link and its bit timing

constexpr std::size_t Align4(std::size_t n) {
  return (n + 3) & ~std::size_t{3};
}

void ForEachAttribute(const char* p, std::size_t len,
                      const std::function<void(unsigned type, const char* data, std::size_t size)>& visit) {
  std::size_t off = 0;
  while (off + sizeof(rtattr) <= len) {
    rtattr a;
    std::memcpy(&a, p + off, sizeof a);
    if (a.rta_len < sizeof a || off + a.rta_len > len) return;
    visit(a.rta_type & NLA_TYPE_MASK, p + off + sizeof a, a.rta_len - sizeof a);
    off += Align4(a.rta_len);
  }
}

struct LinkInfo {
  std::string kind;
  std::uint32_t bitRate = 0;  // 0 when the link reports no bit timing
};

bool QueryLink(int ifindex, LinkInfo* info, std::string* error) {
  const int fd = ::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE);
  if (fd < 0) {
    *error = CanSystemError("netlink socket");
    return false;
  }
  struct {
    nlmsghdr header;
    ifinfomsg link;
  } request{};
  request.header.nlmsg_len = sizeof request;
  request.header.nlmsg_type = RTM_GETLINK;
  request.header.nlmsg_flags = NLM_F_REQUEST;
  request.header.nlmsg_seq = 1;
  request.link.ifi_family = AF_UNSPEC;
  request.link.ifi_index = ifindex;
  sockaddr_nl kernel{};
  kernel.nl_family = AF_NETLINK;
  std::vector<std::uint64_t> storage(8192);  // aligned room for one link message with its statistics
  char* buf = reinterpret_cast<char*>(storage.data());
  ssize_t n = -1;
  if (::sendto(fd, &request, sizeof request, 0, reinterpret_cast<sockaddr*>(&kernel), sizeof kernel) < 0) {
    *error = CanSystemError("netlink send");
  } else {
    pollfd p{fd, POLLIN, 0};
    if (::poll(&p, 1, kNetlinkMilliseconds) != 1)
      *error = "netlink: no answer";
    else if ((n = ::recv(fd, buf, storage.size() * sizeof(std::uint64_t), 0)) < 0)
      *error = CanSystemError("netlink receive");
  }
  ::close(fd);
  if (n < 0) return false;
  const std::size_t len = static_cast<std::size_t>(n);
  std::size_t off = 0;
  while (off + sizeof(nlmsghdr) <= len) {
    nlmsghdr h;
    std::memcpy(&h, buf + off, sizeof h);
    if (h.nlmsg_len < sizeof h || off + h.nlmsg_len > len) break;
    if (h.nlmsg_type == NLMSG_ERROR && h.nlmsg_len >= sizeof h + sizeof(nlmsgerr)) {
      nlmsgerr e;
      std::memcpy(&e, buf + off + Align4(sizeof h), sizeof e);
      if (e.error != 0) {
        *error = std::string("netlink: ") + std::strerror(-e.error);
        return false;
      }
    } else if (h.nlmsg_type == RTM_NEWLINK) {
      const std::size_t attrs = Align4(sizeof h) + Align4(sizeof(ifinfomsg));
      if (h.nlmsg_len < attrs) break;
      ForEachAttribute(buf + off + attrs, h.nlmsg_len - attrs,
                       [&](unsigned type, const char* d, std::size_t s) {
                         if (type != IFLA_LINKINFO) return;
                         ForEachAttribute(d, s, [&](unsigned t2, const char* d2, std::size_t s2) {
                           if (t2 == IFLA_INFO_KIND) info->kind.assign(d2, ::strnlen(d2, s2));
                           if (t2 != IFLA_INFO_DATA) return;
                           ForEachAttribute(d2, s2, [&](unsigned t3, const char* d3, std::size_t s3) {
                             if (t3 != IFLA_CAN_BITTIMING || s3 < sizeof(can_bittiming)) return;
                             can_bittiming timing;
                             std::memcpy(&timing, d3, sizeof timing);
                             info->bitRate = timing.bitrate;
                           });
                         });
                       });
      return true;
    }
    off += Align4(h.nlmsg_len);
  }
  *error = "netlink: no link information";
  return false;
}

// ---- the channel

class SocketCanChannel final : public CanDriverChannel {
 public:
  SocketCanChannel(std::string name, int ifindex, int fd, int stopFd, bool controllerTiming,
                   std::shared_ptr<CanFrameSink> sink)
      : name_(std::move(name)),
        ifindex_(ifindex),
        controllerTiming_(controllerTiming),
        sink_(std::move(sink)),
        reader_(fd, stopFd) {
    reader_.Start([this] { ReadLoop(); });
  }

  ~SocketCanChannel() override { reader_.Stop(); }

  CanResult Transmit(const CanFrameRecord& frame, std::string* error) override {
    can_frame cf{};
    cf.can_id = frame.IsExtended() ? ((frame.identifier & CAN_EFF_MASK) | CAN_EFF_FLAG)
                                   : (frame.identifier & CAN_SFF_MASK);
    if (frame.frameType == kCanFrameRemote) cf.can_id |= CAN_RTR_FLAG;
    cf.len = frame.length;
    std::memcpy(cf.data, frame.data, sizeof cf.data);
    for (;;) {
      const ssize_t n = ::write(reader_.Fd(), &cf, sizeof cf);
      if (n == static_cast<ssize_t>(sizeof cf)) return CanResult::kOk;
      if (n < 0 && errno == EINTR) continue;
      *error = n < 0 && errno == ENOBUFS ? "the interface's transmit queue is full" : CanSystemError("write");
      return CanResult::kBusError;
    }
  }

  bool HasControllerTiming() const override { return controllerTiming_; }

  CanResult ReadControllerBitRate(std::uint32_t* bitRate, std::string* error) override {
    LinkInfo info;
    if (!QueryLink(ifindex_, &info, error)) return CanResult::kBusError;
    *bitRate = info.bitRate;
    return CanResult::kOk;
  }

  std::string TraceName() const override { return name_; }

 private:
  void ReadLoop() {
    for (;;) {
      if (reader_.WaitReadable() != CanReaderThread::Wake::kReadable) return;
      can_frame cf{};
      const ssize_t n = ::read(reader_.Fd(), &cf, sizeof cf);
      if (n == static_cast<ssize_t>(sizeof cf)) {
        sink_->Deliver(Convert(cf));
        continue;
      }
      if (n < 0 && (errno == EINTR || errno == EAGAIN)) continue;
      // The interface went down (or worse): say so once as a bus status; the
      // socket reports the error only once, so polling goes on quietly.
      CanFrameRecord status;
      status.frameType = kCanFrameBusStatus;
      sink_->Deliver(status);
      if (n < 0 && errno != ENETDOWN) return;
    }
  }

  static CanFrameRecord Convert(const can_frame& cf) {
    CanFrameRecord f;
    if ((cf.can_id & CAN_ERR_FLAG) != 0) {
      f.frameType = kCanFrameError;
      f.identifier = cf.can_id & CAN_ERR_MASK;
      f.flags = kCanFlagExtended;
    } else {
      f.frameType = (cf.can_id & CAN_RTR_FLAG) != 0 ? kCanFrameRemote : kCanFrameData;
      const bool extended = (cf.can_id & CAN_EFF_FLAG) != 0;
      f.identifier = cf.can_id & (extended ? CAN_EFF_MASK : CAN_SFF_MASK);
      f.flags = extended ? kCanFlagExtended : 0;
    }
    f.length = std::min<std::uint8_t>(cf.len, 8);
    std::memcpy(f.data, cf.data, sizeof f.data);
    return f;
  }

  std::string name_;
  int ifindex_;
  bool controllerTiming_;
  std::shared_ptr<CanFrameSink> sink_;
  CanReaderThread reader_;
};

class SocketCanDriver final : public CanDriver {
 public:
  std::vector<std::string> ListInterfaces() override {
    std::vector<std::string> names;
    std::error_code ec;
    for (const auto& entry : std::filesystem::directory_iterator("/sys/class/net", ec)) {
      const std::string name = entry.path().filename().string();
      if (IsCanInterface(name)) names.push_back(name);
    }
    std::sort(names.begin(), names.end(), NaturalLess);
    return names;
  }

  bool IsAvailable(const std::string& interfaceName) override { return IsCanInterface(interfaceName); }

  std::unique_ptr<CanDriverChannel> Open(const std::string& name, std::shared_ptr<CanFrameSink> sink,
                                         CanResult* result, std::string* error) override {
    *result = CanResult::kNoChannel;
    if (!IsCanInterface(name)) {
      *error = "no kernel CAN interface \"" + name + "\"";
      return nullptr;
    }
    if (!IsUp(name)) {
      *error = "\"" + name + "\" is down (ip link set " + name + " up)";
      return nullptr;
    }
    const int fd = ::socket(PF_CAN, SOCK_RAW | SOCK_CLOEXEC, CAN_RAW);
    if (fd < 0) {
      *error = "the kernel offers no raw CAN sockets (" + CanSystemError("socket") + ")";
      return nullptr;
    }
    auto fail = [&](const std::string& text) {
      *error = text;
      ::close(fd);
      return nullptr;
    };
    const int ifindex = static_cast<int>(::if_nametoindex(name.c_str()));
    if (ifindex == 0) return fail(CanSystemError("if_nametoindex"));
    // Error frames too: the transfer interface counts them.
    const can_err_mask_t errors = CAN_ERR_MASK;
    ::setsockopt(fd, SOL_CAN_RAW, CAN_RAW_ERR_FILTER, &errors, sizeof errors);
    sockaddr_can address{};
    address.can_family = AF_CAN;
    address.can_ifindex = ifindex;
    if (::bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0)
      return fail(CanSystemError("bind"));
    const int stopFd = ::eventfd(0, EFD_CLOEXEC);
    if (stopFd < 0) return fail(CanSystemError("eventfd"));
    // A virtual CAN interface has no controller and no bit rate: the layer
    // keeps its timing as for the in-process bus. Any other kind (or one that
    // cannot be told) is a controller the administrator set up.
    LinkInfo info;
    std::string ignored;
    const bool controllerTiming =
        !QueryLink(ifindex, &info, &ignored) || (info.kind != "vcan" && info.kind != "vxcan");
    *result = CanResult::kOk;
    return std::make_unique<SocketCanChannel>(name, ifindex, fd, stopFd, controllerTiming, std::move(sink));
  }
};

}  // namespace

std::shared_ptr<CanDriver> MakeSocketCanDriver() {
  return std::make_shared<SocketCanDriver>();
}

}  // namespace faultbox
