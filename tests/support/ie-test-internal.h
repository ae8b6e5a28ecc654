/* Shared between the harness and its main(): the EFL error lines seen. */
#ifndef IE_TEST_INTERNAL_H
#define IE_TEST_INTERNAL_H

#include <string>
#include <vector>

namespace iet {

std::vector<std::string> &efl_errors();
std::vector<std::string> &allowed_efl_errors();
void efl_errors_clear();

} // namespace iet

#endif
