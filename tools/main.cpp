#include "tools/cli.h"

int main(int argc, char** argv) {
  return tools::RunCommandLine(argc, argv);
}
