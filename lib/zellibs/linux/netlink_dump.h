// What the kernel tells of the reader's network namespace over rtnetlink.
#pragma once

#include <linux/netlink.h>
#include <linux/rtnetlink.h>

#include <cstddef>

#include "base/bytes.h"
#include "zellibs.h"

// Asks for all objects of a type (RTM_GETLINK and so on) and puts the messages of the answer into
// `answers`, one behind the other, each checked to lie inside. A list that changed while it was
// told is asked for again. Not found in a foreign tree, and from a kernel without the protocol.
KIF_Status DumpNetlink(uint16_t type, Bytes *answers);

// Calls `take` with the header of each message of `type` that holds a `Body` and its attributes.
template <typename Body, typename Take>
KIF_Status ForEachMessage(const Bytes &answers, uint16_t type, Take take) {
  KIF_Status status = 0;
  for (size_t place = 0; status == 0 && place < answers.size();) {
    const auto *header = reinterpret_cast<const nlmsghdr *>(answers.text() + place);
    const bool fits = header->nlmsg_len >= NLMSG_LENGTH(sizeof(Body));
    if (header->nlmsg_type == type && fits) {
      const auto *body = static_cast<const Body *>(NLMSG_DATA(header));
      const char *attributes = reinterpret_cast<const char *>(body) + NLMSG_ALIGN(sizeof(Body));
      const char *end = reinterpret_cast<const char *>(header) + header->nlmsg_len;
      status = take(*body, attributes,
                    end > attributes ? static_cast<size_t>(end - attributes) : size_t{0});
    }
    place += NLMSG_ALIGN(header->nlmsg_len);
  }
  return status;
}

// Calls `take` with type, bytes and size of each attribute.
template <typename Take>
void ForEachAttribute(const char *place, size_t left, Take take) {
  while (left >= sizeof(rtattr)) {
    const auto *attribute = reinterpret_cast<const rtattr *>(place);
    if (attribute->rta_len < sizeof(rtattr) || attribute->rta_len > left) return;
    take(attribute->rta_type & NLA_TYPE_MASK, place + RTA_LENGTH(0),
         size_t{attribute->rta_len} - RTA_LENGTH(0));
    const size_t step = RTA_ALIGN(attribute->rta_len);
    if (step >= left) return;
    place += step;
    left -= step;
  }
}
