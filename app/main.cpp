#include "app/ApplicationMain.h"

int main(int argc, char** argv) {
    return qivo::applicationMain(argc, argv);
}
