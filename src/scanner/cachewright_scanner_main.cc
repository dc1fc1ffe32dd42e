#include "scanner/scanner_service.h"

int main(int argc, char** argv) { return qr::runScanner(argc, argv); }
