// The pmdeviceid program, apart from its process: device ID strings or
// property-list dictionaries in, JSON Lines (or escaped strings) out.
#pragma once

#include <iosfwd>
#include <string>
#include <vector>

namespace qr::deviceid {

enum PMDeviceIDStatus { kPMDeviceIDOK = 0, kPMDeviceIDUsage = 1, kPMDeviceIDBadInput = 2 };

// args are the command-line arguments after the program name. Returns the
// exit status: 0, 1 for a usage error, 2 when some input could not be read,
// parsed or (with --escape) written in the encoding; the others still run.
int runPMDeviceID(const std::vector<std::string>& args, std::istream& in, std::ostream& out,
                  std::ostream& err);

}  // namespace qr::deviceid
