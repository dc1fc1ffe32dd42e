// The helper's side: cachewright-scanner answers the run's calls into
// plug-ins, one request at a time, until the run closes the socket. It keeps
// no decisions of its own: what to ask and what to record stays with the run.
#pragma once

namespace qr {

// The whole helper program; returns its exit status.
int runScanner(int argc, char** argv);

}  // namespace qr
