// kivimaging: the library's effects on picture files, from a shell.
#include "cli.h"

int main(int argc, char** argv) {
    return kivcli::cliMain(argc, argv);
}
