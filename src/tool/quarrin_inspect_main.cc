#include "tool/inspector.h"

int main(int argc, char** argv) { return qr::runInspect(argc, argv); }
