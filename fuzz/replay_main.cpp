// main() of a fuzz target in a build without libFuzzer: runs the target once
// on every file named, or found directly inside a named directory, so that
// seeds and crash reproducers replay as ordinary tests (under the sanitizers
// in the sanitizer build).
#include <dirent.h>
#include <sys/stat.h>

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include <android-base/file.h>

extern "C" int LLVMFuzzerInitialize(int* argc, char*** argv) __attribute__((weak));
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

namespace {

void Collect(const std::string& path, std::vector<std::string>* files) {
  struct stat info;
  if (stat(path.c_str(), &info) != 0) return;  // an empty corpus may not exist
  if (!S_ISDIR(info.st_mode)) {
    files->push_back(path);
    return;
  }
  DIR* dir = opendir(path.c_str());
  if (dir == nullptr) return;
  while (dirent* entry = readdir(dir)) {
    if (entry->d_name[0] == '.') continue;
    files->push_back(path + "/" + entry->d_name);
  }
  closedir(dir);
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
