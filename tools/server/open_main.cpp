// Entry point of the tessel_open executable; the command line lives in open_cli.cpp.
#include "server/open_cli.h"

int main(int argc, char** argv) { return tessel::server::openMain(argc, argv); }
