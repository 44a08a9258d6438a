/* A C11 program uses Vox values, too. */
#include "vox/value.h"

int values_work(void);

int values_work(void) {
    vox_object_t message = vox_dictionary_create();
    vox_object_t number = vox_int64_create(-73);
    vox_dictionary_set_value(message, "dBm", number);
    vox_release(number);
    const int64_t read = vox_int64_get_value(vox_dictionary_get_value(message, "dBm"));
    vox_release(message);
    return read == -73;
}
