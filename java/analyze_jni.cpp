// The native half of com.kestu.tavo.Analyze: what the command needs of the library beyond its Java
// class. A library of its own, since libtavo.so exports the host interface alone.
#include <jni.h>

#include "core/tavo.h"

extern "C" JNIEXPORT void JNICALL Java_com_kestu_tavo_Analyze_writeNoClickTrack(JNIEnv *, jclass) {
    fnamedec = "";
}
