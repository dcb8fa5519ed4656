// main() of a fuzz target in a build without libFuzzer: runs the target once
// on every file named, or found directly inside a named directory, so that
// seeds and crash reproducers replay as ordinary tests (under the sanitizers
// in the sanitizer build).
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <string>
#include <system_error>
#include <vector>

#include <android-base/file.h>

extern "C" int LLVMFuzzerInitialize(int* argc, char*** argv) __attribute__((weak));
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

namespace {

// An empty corpus may not exist: nothing to replay then.
void Collect(const std::filesystem::path& path, std::vector<std::string>* files) {
  std::error_code error;
  if (!std::filesystem::is_directory(path, error)) {
    if (std::filesystem::exists(path, error)) files->push_back(path);
    return;
  }
  for (const auto& entry : std::filesystem::directory_iterator(path, error)) {
    if (entry.path().filename().string()[0] != '.') files->push_back(entry.path());
  }
}

}  // namespace

int main(int argc, char** argv) {
  if (LLVMFuzzerInitialize) LLVMFuzzerInitialize(&argc, &argv);
  std::vector<std::string> files;
  for (int i = 1; i < argc; ++i) Collect(argv[i], &files);
  for (const std::string& file : files) {
    std::string data;
    if (!android::base::ReadFileToString(file, &data)) {
      fprintf(stderr, "cannot read %s\n", file.c_str());
      return 1;
    }
    fprintf(stderr, "replaying %s\n", file.c_str());
    LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(data.data()), data.size());
  }
  fprintf(stderr, "%zu inputs replayed\n", files.size());
  return 0;
}
