#include "extension/NSExtensionMain.h"

int main(int argc, char *argv[]) {
  return droxa::NSExtensionMain(argc, argv);
}
