// Generates unique identifiers with libuuid.
#include "platform/identifiers.h"

#include <uuid.h>

namespace lmx {

std::string newUUIDString() {
  uuid_t id;
  uuid_generate_random(id);
  char text[UUID_STR_LEN];
  uuid_unparse_upper(id, text);
  return text;
}

}  // namespace lmx
