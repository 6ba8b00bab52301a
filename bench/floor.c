// The floor under kestrel's cost: the system calls of a quiet run, in their order and with fixed
// paths, and nothing else: no decision, no copy of a text, no check of a result.

#include <dirent.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#define STORAGE "/var/db/timezone/"
#define DOWNLOAD STORAGE "tz/2022b.2.0"

static char buffer[4096];
static volatile ssize_t ignored;

static void mark(const char* path) {
  const int directory = open(path, O_RDONLY | O_CLOEXEC);
  fcntl(directory, 64, 4);
  close(directory);
}

static void read_word(const char* path) {
  const int file = open(path, O_RDONLY | O_CLOEXEC);
  ignored = read(file, buffer, sizeof buffer);
  close(file);
}

static void read_download(void) {
  struct stat found;
  read_word(DOWNLOAD "/zoneinfo/+VERSION");
  DIR* const directory = opendir(DOWNLOAD "/icutz");
  while (strcmp(readdir(directory)->d_name, "icutz44l.dat") != 0) {
  }
  fstatat(dirfd(directory), "icutz44l.dat", &found, AT_SYMLINK_NOFOLLOW);
  closedir(directory);
}

int main(void) {
  static const char message[] = "floor: New update not compatible or older version\n";
  mark(STORAGE);
  mark(STORAGE "tz/");
  access("/var/db/icutz", F_OK);
  access("/var/db/icutz", F_OK);
  remove("/var/db/icu");
  read_word("/usr/share/zoneinfo.default/+VERSION");
  read_word("/usr/share/icu/icutzformat.txt");
  ignored = readlink(STORAGE "tz_latest", buffer, sizeof buffer);
  ignored = readlink(STORAGE "zoneinfo", buffer, sizeof buffer);
  read_download();
  ignored = readlink(STORAGE "icutz.new", buffer, sizeof buffer);
  read_download();
  ignored = write(STDERR_FILENO, message, strlen(message));
  ignored = readlink(STORAGE "localtime", buffer, sizeof buffer);
  return 0;
}
