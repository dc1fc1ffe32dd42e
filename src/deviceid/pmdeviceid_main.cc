// pmdeviceid: the device ID operations for scripts and people.
#include <iostream>

#include "deviceid/pmdeviceid_tool.h"

int main(int argc, char** argv) {
  std::ios::sync_with_stdio(false);
  std::vector<std::string> args(argv + 1, argv + argc);
  return qr::deviceid::runPMDeviceID(args, std::cin, std::cout, std::cerr);
}
