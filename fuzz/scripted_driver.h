#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include <android-base/unique_fd.h>

#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace fuzz {

// A driver whose every word comes from a fuzzer's input. The input is a
// script: records of a 16-bit little-endian length and that many bytes, each
// one datagram, an empty record closing the answer to one request. Each
// request sent on a socket of factory() is answered with the script's next
// answer, queued on the socket before the send returns; a message's sequence
// number in the script counts from the request's own, so 0 is the matching
// one. Sockets do not block: once the answer is read, the next read fails
// as a receive timeout would. One instance per process, fuzzer thread only.
class ScriptedDriver {
 public:
  ScriptedDriver();
  ~ScriptedDriver();
  ScriptedDriver(const ScriptedDriver&) = delete;
  ScriptedDriver& operator=(const ScriptedDriver&) = delete;

  // Replaces the script; answers not taken by the previous input are dropped.
  void Load(const uint8_t* data, size_t size);
  NlSocketFactory* factory() { return factory_.get(); }

  // Script writing, for seeds and tests.
  static void AppendDatagram(std::string* script, const uint8_t* data, size_t size);
  static void AppendEndOfAnswer(std::string* script);

  // Sends the next answer to |port|, each message's sequence number moved by
  // |seq|. Called from the sockets' send hook.
  void Answer(uint32_t port, uint32_t seq);

 private:
  android::base::unique_fd socket_;
  std::vector<std::vector<std::vector<uint8_t>>> answers_;
  size_t next_answer_ = 0;
  std::unique_ptr<NlSocketFactory> factory_;
};

}  // namespace fuzz
}  // namespace dalix
}  // namespace hardware
