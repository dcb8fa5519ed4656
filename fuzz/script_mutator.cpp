// Structure-aware mutation of ScriptedDriver scripts: besides libFuzzer's own
// byte-level changes, half the time one message's payload is mutated and its
// netlink length fixed up, so that the datagram's framing stays valid and the
// change reaches the attribute parsers instead of libnl's framing checks.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include <linux/netlink.h>

extern "C" size_t LLVMFuzzerMutate(uint8_t* data, size_t size, size_t max_size);

namespace {

struct Record {
  size_t offset;  // of the datagram's bytes within the input
  size_t length;
};

std::vector<Record> Records(const uint8_t* data, size_t size) {
  std::vector<Record> records;
  size_t at = 0;
  while (at + 2 <= size) {
    size_t length = data[at] | (data[at + 1] << 8);
    at += 2;
    if (length > size - at) length = size - at;
    if (length >= NLMSG_HDRLEN) records.push_back({at, length});
    at += length;
  }
  return records;
}

// Offsets of the well-framed messages of one datagram.
std::vector<size_t> Messages(const uint8_t* datagram, size_t length) {
  std::vector<size_t> messages;
  size_t at = 0;
  while (at + NLMSG_HDRLEN <= length) {
    nlmsghdr header;
    memcpy(&header, datagram + at, sizeof(header));
    if (header.nlmsg_len < NLMSG_HDRLEN || header.nlmsg_len > length - at) break;
    messages.push_back(at);
    at += NLMSG_ALIGN(header.nlmsg_len);
  }
  return messages;
}

}  // namespace

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t* data, size_t size, size_t max_size,
                                          unsigned int seed) {
  std::minstd_rand random(seed);
  std::vector<Record> records = Records(data, size);
  if (records.empty() || random() % 2 == 0) return LLVMFuzzerMutate(data, size, max_size);

  const Record record = records[random() % records.size()];
  std::vector<size_t> messages = Messages(data + record.offset, record.length);
  if (messages.empty()) return LLVMFuzzerMutate(data, size, max_size);
  const size_t message = record.offset + messages[random() % messages.size()];
  nlmsghdr header;
  memcpy(&header, data + message, sizeof(header));

  // Mutate the payload on its own, then splice it back with lengths fixed.
  const size_t old_payload = header.nlmsg_len - NLMSG_HDRLEN;
  const size_t room = max_size - size + old_payload;
  std::vector<uint8_t> payload(data + message + NLMSG_HDRLEN,
                               data + message + NLMSG_HDRLEN + old_payload);
  const size_t limit = std::min<size_t>(room, 0xFFFF - (record.length - old_payload));
  payload.resize(std::max<size_t>(limit, 1));
  const size_t new_payload = LLVMFuzzerMutate(payload.data(), old_payload, payload.size());
  payload.resize(new_payload);

  // The message's slot runs to its aligned end (or the datagram's), so the
  // messages after it keep their alignment.
  const size_t record_end = record.offset + record.length;
  const size_t old_slot =
      std::min(message + NLMSG_ALIGN(header.nlmsg_len), record_end) - (message + NLMSG_HDRLEN);
  header.nlmsg_len = static_cast<uint32_t>(NLMSG_HDRLEN + payload.size());
  if (message + NLMSG_HDRLEN + old_slot < record_end) payload.resize(NLMSG_ALIGN(payload.size()));
  std::string out(reinterpret_cast<char*>(data), size);
  out.replace(message + NLMSG_HDRLEN, old_slot, reinterpret_cast<const char*>(payload.data()),
              payload.size());
  memcpy(&out[message], &header, sizeof(header));
  const size_t new_length = record.length - old_slot + payload.size();
  if (new_length > 0xFFFF) return LLVMFuzzerMutate(data, size, max_size);
  out[record.offset - 2] = static_cast<char>(new_length & 0xFF);
  out[record.offset - 1] = static_cast<char>(new_length >> 8);
  if (out.size() > max_size) return LLVMFuzzerMutate(data, size, max_size);
  memcpy(data, out.data(), out.size());
  return out.size();
}
