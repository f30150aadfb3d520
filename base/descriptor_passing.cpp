#include "base/descriptor_passing.h"

#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

namespace base {

namespace {

/// A message of one part, with room for descriptors.
struct Message {
  Message(void* bytes, size_t size) : part{bytes, size} {
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    header.msg_control = control;
    header.msg_controllen = sizeof(control);
  }
  Message(const Message&) = delete;
  Message& operator=(const Message&) = delete;

  iovec part;
  msghdr header = {};
  alignas(cmsghdr) char control[CMSG_SPACE(kPassedMax * sizeof(int))] = {};
};

}  // namespace

bool SendWithDescriptors(int socket, std::string_view bytes, std::initializer_list<int> descriptors) {
  Message message(const_cast<char*>(bytes.data()), bytes.size());
  const size_t size = descriptors.size() * sizeof(int);
  cmsghdr* ancillary = CMSG_FIRSTHDR(&message.header);
  ancillary->cmsg_level = SOL_SOCKET;
  ancillary->cmsg_type = SCM_RIGHTS;
  ancillary->cmsg_len = CMSG_LEN(size);
  memcpy(CMSG_DATA(ancillary), descriptors.begin(), size);
  message.header.msg_controllen = CMSG_SPACE(size);
  ssize_t sent;
  do {
    sent = sendmsg(socket, &message.header, MSG_NOSIGNAL | MSG_DONTWAIT);
  } while (sent < 0 && errno == EINTR);
  return sent == static_cast<ssize_t>(bytes.size());
}

ssize_t ReceiveWithDescriptors(int socket, void* to, size_t size, int* descriptors, size_t count) {
  Message message(to, size);
  ssize_t got;
  do {
    got = recvmsg(socket, &message.header, MSG_CMSG_CLOEXEC);
  } while (got < 0 && errno == EINTR);
  std::fill_n(descriptors, count, -1);
  const cmsghdr* ancillary = got > 0 ? CMSG_FIRSTHDR(&message.header) : nullptr;
  if (ancillary == nullptr || ancillary->cmsg_type != SCM_RIGHTS) return got;
  int received[kPassedMax];
  const size_t received_count = (ancillary->cmsg_len - CMSG_LEN(0)) / sizeof(int);
  memcpy(received, CMSG_DATA(ancillary), received_count * sizeof(int));
  if (received_count == count) {
    std::copy_n(received, count, descriptors);
  } else {
    for (size_t i = 0; i < received_count; ++i) (void)close(received[i]);
  }
  return got;
}

}  // namespace base
