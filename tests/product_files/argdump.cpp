// Writes each of its arguments on a line of the file named by KXLTEST_ARGDUMP
// (a host path) and ends with exit code 7.
#include <cstdio>
#include <cstdlib>

int main(int argc, char **argv) {
  const char *out = std::getenv("KXLTEST_ARGDUMP");
  if (out == nullptr)
    return 2;
  std::FILE *file = std::fopen(out, "wb");
  if (file == nullptr)
    return 3;
  for (int i = 1; i < argc; ++i)
    std::fprintf(file, "%s\n", argv[i]);
  std::fclose(file);
  return 7;
}
