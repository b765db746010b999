#include "MountPointCommand.h"

int main(int argumentCount, char** arguments) {
  return runMountPointCommand(argumentCount, arguments);
}
