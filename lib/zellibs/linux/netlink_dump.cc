#include "linux/netlink_dump.h"

#include <errno.h>
#include <sys/socket.h>

#include <cstring>

#include "linux/files.h"
#include "status.h"

namespace {

constexpr size_t kMostAnswers = size_t{256} << 20;
constexpr int kMostAttempts = 5;

enum class Dump { kGoesOn, kDone, kChanged, kFailed };

struct Asked {
  uint32_t sequence;
  bool changed;
  KIF_Status status;
};

KIF_Status StatusOfRefusal(int error) {
  return error == EOPNOTSUPP || error == EAFNOSUPPORT || error == EPROTONOSUPPORT
             ? KIF_STATUS_NOT_FOUND
             : StatusOfErrno(error);
}

KIF_Status Ask(const Descriptor &socket, uint16_t type, uint32_t sequence) {
  struct {
    nlmsghdr header;
    rtgenmsg family;
  } request = {};
  request.header.nlmsg_len = NLMSG_LENGTH(sizeof(request.family));
  request.header.nlmsg_type = type;
  request.header.nlmsg_flags = NLM_F_REQUEST | NLM_F_DUMP;
  request.header.nlmsg_seq = sequence;
  sockaddr_nl kernel = {};
  kernel.nl_family = AF_NETLINK;
  const ssize_t sent = sendto(socket.fd(), &request, sizeof(request), 0,
                              reinterpret_cast<const sockaddr *>(&kernel), sizeof(kernel));
  return sent < 0 ? StatusOfRefusal(errno) : KIF_STATUS_OK;
}

// Takes the messages of one piece that was received. Others' answers are passed over.
Dump TakePiece(const char *piece, size_t size, Asked *asked, Bytes *answers) {
  while (size >= sizeof(nlmsghdr)) {
    const auto *header = reinterpret_cast<const nlmsghdr *>(piece);
    const size_t length = header->nlmsg_len;
    if (length < sizeof(nlmsghdr) || length > size) break;
    const size_t step = NLMSG_ALIGN(length) < size ? NLMSG_ALIGN(length) : size;
    if (header->nlmsg_seq == asked->sequence) {
      asked->changed = asked->changed || (header->nlmsg_flags & NLM_F_DUMP_INTR) != 0;
      if (header->nlmsg_type == NLMSG_DONE) return asked->changed ? Dump::kChanged : Dump::kDone;
      if (header->nlmsg_type == NLMSG_ERROR) {
        const auto *error = reinterpret_cast<const nlmsgerr *>(NLMSG_DATA(header));
        const bool told = length >= NLMSG_LENGTH(sizeof(*error));
        asked->status = StatusOfRefusal(told ? -error->error : EIO);
        return Dump::kFailed;
      }
      static constexpr char kPadding[NLMSG_ALIGNTO] = {};
      if (!answers->Append(piece, length) ||
          !answers->Append(kPadding, NLMSG_ALIGN(length) - length)) {
        asked->status = KIF_STATUS_NO_MEMORY;
        return Dump::kFailed;
      }
    }
    piece += step;
    size -= step;
  }
  return Dump::kGoesOn;
}

Dump Receive(const Descriptor &socket, Asked *asked, Bytes *answers) {
  alignas(NLMSG_ALIGNTO) static char piece[32768];  // the kernel's longest, but for huge links
  sockaddr_nl sender = {};
  iovec bytes = {piece, sizeof(piece)};
  msghdr message = {};
  message.msg_name = &sender;
  message.msg_namelen = sizeof(sender);
  message.msg_iov = &bytes;
  message.msg_iovlen = 1;
  const ssize_t got = recvmsg(socket.fd(), &message, 0);
  if (got < 0 && errno == EINTR) return Dump::kGoesOn;
  if (got < 0 && errno == ENOBUFS) return Dump::kChanged;
  if (got <= 0 || (message.msg_flags & MSG_TRUNC) != 0 || answers->size() > kMostAnswers) {
    asked->status = answers->size() > kMostAnswers ? KIF_STATUS_TOO_LARGE : KIF_STATUS_IO_ERROR;
    return Dump::kFailed;
  }
  if (sender.nl_pid != 0) return Dump::kGoesOn;
  return TakePiece(piece, static_cast<size_t>(got), asked, answers);
}

}  // namespace

KIF_Status DumpNetlink(uint16_t type, Bytes *answers) {
  if (IsForeignRoot()) return KIF_STATUS_NOT_FOUND;
  for (uint32_t attempt = 1; attempt <= kMostAttempts; ++attempt) {
    answers->Clear();
    const Descriptor socket(::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE));
    if (!socket.valid()) return StatusOfRefusal(errno);
    const timeval patience = {2, 0};
    (void)setsockopt(socket.fd(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
    Asked asked = {attempt, false, Ask(socket, type, attempt)};
    if (asked.status != KIF_STATUS_OK) return asked.status;
    Dump dump = Dump::kGoesOn;
    while (dump == Dump::kGoesOn) dump = Receive(socket, &asked, answers);
    if (dump == Dump::kDone) return KIF_STATUS_OK;
    if (dump == Dump::kFailed) return asked.status;
  }
  return KIF_STATUS_IO_ERROR;
}
