#include "tools/service_dump.h"

#include <stdio.h>
#include <string.h>

#include <memory>

namespace hardware {
namespace dalix {
namespace tools {

std::string DumpService(AIBinder* binder) {
  // A file rather than a pipe: the service writes the whole dump before the
  // call returns, and a pipe's buffer could fill first.
  std::unique_ptr<FILE, int (*)(FILE*)> file(tmpfile(), fclose);
  if (file == nullptr) return std::string("dump: no temporary file: ") + strerror(errno) + "\n";
  const binder_status_t status = AIBinder_dump(binder, fileno(file.get()), nullptr, 0);
  if (status != STATUS_OK) return "dump: failed with status " + std::to_string(status) + "\n";
  rewind(file.get());
  std::string text;
  char buffer[4096];
  size_t size;
  while ((size = fread(buffer, 1, sizeof(buffer), file.get())) > 0) text.append(buffer, size);
  return text;
}

}  // namespace tools
}  // namespace dalix
}  // namespace hardware
