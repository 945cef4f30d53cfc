// bench_make_files FOLDER COUNT [PER_FOLDER]: makes COUNT empty documents, all in FOLDER or PER_FOLDER to a
// subfolder.

#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

int main(int argc, char **argv) {
  if (argc < 3) {
    std::fprintf(stderr, "usage: %s FOLDER COUNT [PER_FOLDER]\n", argv[0]);
    return 2;
  }
  const std::string root = argv[1];
  const long count = std::atol(argv[2]);
  const long perFolder = argc > 3 ? std::atol(argv[3]) : count;
  mkdir(root.c_str(), 0755);
  int folder = -1;
  for (long i = 0; i < count; ++i) {
    if (i % perFolder == 0) {
      if (folder >= 0) close(folder);
      std::string path = root;
      if (perFolder < count) {
        path += "/folder " + std::to_string(i / perFolder);
        mkdir(path.c_str(), 0755);
      }
      folder = open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    }
    char name[40];
    std::snprintf(name, sizeof name, "document %07ld.txt", i);
    const int file = openat(folder, name, O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    if (file < 0) {
      std::perror(name);
      return 1;
    }
    close(file);
  }
  close(folder);
}
