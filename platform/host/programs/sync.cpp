#include "platform/host/stand-in/stand-in.h"

/* The handset's sync program. The machine under the handset is never asked to write anything out. */
int main()
{
    return stand_in_answer_call("sync", "");
}
