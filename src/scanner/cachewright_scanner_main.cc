#include "scanner/scanner_service.h"

// A plug-in that crashes must end the helper by its own signal, so that the
// run can name it; a sanitizer build would otherwise turn it into an exit.
extern "C" const char* __asan_default_options() {
  return "handle_segv=0:handle_sigbus=0:handle_sigfpe=0:handle_abort=0";
}

int main(int argc, char** argv) { return qr::runScanner(argc, argv); }
