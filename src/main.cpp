#include "vornreport/driver.hpp"

int main(int argc, char** argv) {
  return vornreport::run(argc, argv);
}
