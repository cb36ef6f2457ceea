#include "tools/command_line.h"

int main(int argc, char** argv) {
  return tools::RunCommandLine(argc, argv);
}
