// SPDX-License-Identifier: Apache-2.0
// Helpers for the tests of the Java-facing layer: a minimal JNI environment for calling the native
// methods without a JVM (Java strings and arrays are test-owned objects, and every obtain/release
// is counted so a test can check the pairing), the Java entry points, PCM source files and the
// registry's log lines.
#ifndef KOVA_TESTS_JNI_TEST_SUPPORT_H
#define KOVA_TESTS_JNI_TEST_SUPPORT_H

#include <gtest/gtest.h>
#include <jni.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "kova/kova_engine.h"
#include "kova/android/kova_registry.h"
#include "support/log_capture.h"
#include "support/temp_dir.h"
#include "util/kova_mem.h"

namespace fake_jni {

// Strings and arrays obtained and released.
inline std::atomic<int> g_got{0};
inline std::atomic<int> g_released{0};

// Java objects: the fake handles point at these.
struct String {
    std::string utf;
};
struct ArrayBase {  // what GetArrayLength reads without knowing the element type
    jsize length;
};
template <typename T>
struct Array : ArrayBase {
    explicit Array(size_t n = 0, T fill = T{}) : ArrayBase{jsize(n)}, items(n, fill) {}
    std::vector<T> items;
};

template <typename T>
std::vector<T>& items_of(jarray a) {
    return static_cast<Array<T>*>(reinterpret_cast<ArrayBase*>(a))->items;
}

// Elements are handed out as a separate copy, as a VM may do, so only a release with mode 0
// makes the native side's writes visible in the array.
template <typename T>
T* get_elements(jarray a) {
    g_got++;
    auto& items = items_of<T>(a);
    T* copy = new T[items.size() + 1];
    std::copy(items.begin(), items.end(), copy);
    return copy;
}

template <typename T>
void release_elements(jarray a, T* elems, jint mode) {
    g_released++;
    auto& items = items_of<T>(a);
    if (mode == 0 || mode == JNI_COMMIT) std::copy(elems, elems + items.size(), items.begin());
    if (mode != JNI_COMMIT) delete[] elems;
}

inline JNIEnv* env() {
    static JNINativeInterface_ table = [] {
        JNINativeInterface_ t{};
        t.GetStringUTFChars = [](JNIEnv*, jstring s, jboolean* copy) -> const char* {
            g_got++;
            if (copy) *copy = JNI_FALSE;
            return reinterpret_cast<String*>(s)->utf.c_str();
        };
        t.ReleaseStringUTFChars = [](JNIEnv*, jstring, const char*) { g_released++; };
        t.GetArrayLength = [](JNIEnv*, jarray a) -> jsize {
            return reinterpret_cast<ArrayBase*>(a)->length;
        };
        t.GetByteArrayElements = [](JNIEnv*, jbyteArray a, jboolean*) {
            return get_elements<jbyte>(a);
        };
        t.ReleaseByteArrayElements = [](JNIEnv*, jbyteArray a, jbyte* e, jint mode) {
            release_elements<jbyte>(a, e, mode);
        };
        t.GetFloatArrayElements = [](JNIEnv*, jfloatArray a, jboolean*) {
            return get_elements<jfloat>(a);
        };
        t.ReleaseFloatArrayElements = [](JNIEnv*, jfloatArray a, jfloat* e, jint mode) {
            release_elements<jfloat>(a, e, mode);
        };
        return t;
    }();
    static JNIEnv_ e{&table};
    return &e;
}

inline jstring jstr(String& s) {
    return reinterpret_cast<jstring>(&s);
}
inline jbyteArray jbytes(Array<jbyte>& a) {
    return reinterpret_cast<jbyteArray>(static_cast<ArrayBase*>(&a));
}
inline jfloatArray jfloats(Array<jfloat>& a) {
    return reinterpret_cast<jfloatArray>(static_cast<ArrayBase*>(&a));
}

// A VM whose GetEnv answers with a chosen code.
inline jint g_getenv_result = JNI_OK;
inline JavaVM* vm() {
    static JNIInvokeInterface_ table = [] {
        JNIInvokeInterface_ t{};
        t.GetEnv = [](JavaVM*, void** out, jint version) -> jint {
            if (version != JNI_VERSION_1_6) return JNI_EVERSION;
            if (g_getenv_result == JNI_OK) *out = env();
            return g_getenv_result;
        };
        return t;
    }();
    static JavaVM_ v{&table};
    return &v;
}

}  // namespace fake_jni

// The Java entry points, as the VM sees them.
extern "C" {
jint JNI_OnLoad(JavaVM*, void*);
void JNI_OnUnload(JavaVM*, void*);
jlong Java_com_corvane_audio_Kova_init(JNIEnv*, jclass, jint, jint, jint, jint, jint);
jint Java_com_corvane_audio_Kova_deinit(JNIEnv*, jclass, jlong);
jint Java_com_corvane_audio_Kova_reg_1src_1byfiles(JNIEnv*, jclass, jlong, jstring, jstring,
                                                   jstring);
jint Java_com_corvane_audio_Kova_set_1src(JNIEnv*, jclass, jlong, jint);
jint Java_com_corvane_audio_Kova_get_1src_1num(JNIEnv*, jclass, jlong);
jint Java_com_corvane_audio_Kova_gen_1sounds(JNIEnv*, jclass, jlong, jbyteArray, jfloat, jfloat,
                                             jlong, jfloat, jint);
jint Java_com_corvane_audio_Kova_gen_1tofasttrack(JNIEnv*, jclass, jlong, jfloat, jfloat, jlong,
                                                  jfloat, jint);
jint Java_com_corvane_audio_Kova_set_1tuneset(JNIEnv*, jclass, jlong, jint, jdouble, jdouble, jint,
                                              jdouble, jint, jdouble, jdouble, jdouble, jdouble,
                                              jdouble, jdouble);
jint Java_com_corvane_audio_Kova_set_1thickness(JNIEnv*, jclass, jlong, jdouble);
jint Java_com_corvane_audio_Kova_set_1volume(JNIEnv*, jclass, jlong, jdouble);
void Java_com_corvane_audio_Kova_stop_1fasttrack(JNIEnv*, jclass, jlong);
void Java_com_corvane_audio_Kova_start_1fasttrack(JNIEnv*, jclass, jlong);
jint Java_com_corvane_audio_Kova_get_1volumeTableSize(JNIEnv*, jclass, jint);
jint Java_com_corvane_audio_Kova_get_1volumeTable(JNIEnv*, jclass, jfloatArray, jfloatArray);
}

namespace jni_test {

inline jlong init_default() {
    return Java_com_corvane_audio_Kova_init(fake_jni::env(), nullptr, 48000, 2, 1, 1080, 2280);
}
inline jint deinit(jlong id) {
    return Java_com_corvane_audio_Kova_deinit(fake_jni::env(), nullptr, id);
}

// Lines of the Java-facing layer; every one of them must be at info priority.
inline std::vector<std::string> jni_lines(const kova_test::LogCapture& cap) {
    std::vector<std::string> out;
    for (const kova_test::LogLine& l : cap.lines()) {
        if (l.tag != "kova_jni") continue;
        EXPECT_EQ(l.priority, 4) << l.message;
        out.push_back(l.message);
    }
    return out;
}

// Frees every slot and destroys the registry lock, as at load time before the load hook ran.
inline void reset_to_unloaded() {
    for (KovaInfo& slot : pKOVAInfo) {
        if (slot.isUsed == 1 && slot.pInstance) deinit(&slot - pKOVAInfo + 1);
    }
    for (KovaInfo& slot : pKOVAInfo) slot = KovaInfo{0, nullptr, 0};
    pKOVAInfoIsInited = 0;
    if (gpKovaMutex) {
        pthread_mutex_destroy(gpKovaMutex);
        kova_mem_free(gpKovaMutex);
        gpKovaMutex = nullptr;
    }
}

using Lines = std::vector<std::string>;

// Waits (bounded, so a broken stream fails instead of hanging) until `done` holds.
template <typename Pred>
bool wait_for(Pred done) {
    const auto give_up = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    while (!done()) {
        if (std::chrono::steady_clock::now() > give_up) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
}
inline const std::string kPid = std::to_string(getpid());

// Tests that start from a freshly loaded library and leave it unloaded.
class Loaded : public ::testing::Test {
   protected:
    void SetUp() override {
        reset_to_unloaded();
        fake_jni::g_getenv_result = JNI_OK;
        ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    }
    void TearDown() override {
        kova_mem_fail_after(-1);
        reset_to_unloaded();
    }
};

// Takes the engine context away from the instance in `slot` (freeing it).
inline void drop_context(int slot) {
    KovaInstance* inst = pKOVAInfo[slot].pInstance;
    ASSERT_EQ(kova_deinit(inst->pCtx), 0);
    inst->pCtx = nullptr;
}

// Frees a slot the teardowns cannot free (no context) together with its record.
inline void discard(int slot) {
    KovaInstance* inst = pKOVAInfo[slot].pInstance;
    _KovaInfoDelbyKova(inst);
    kova_mem_free(inst);
}

// Raw 16-bit stereo PCM: a quiet sine that stays far from clipping after every gain stage.
class PcmFiles {
   public:
    std::string write(const std::string& name, size_t bytes, double hz) const {
        std::vector<int16_t> s(bytes / 2);
        for (size_t i = 0; i < s.size(); ++i) {
            s[i] = static_cast<int16_t>(400 * std::sin(2 * M_PI * hz * double(i / 2) / 48000.0));
        }
        const std::string path = dir_.file(name);
        std::ofstream(path, std::ios::binary)
            .write(reinterpret_cast<const char*>(s.data()), std::streamsize(bytes));
        return path;
    }

   private:
    kova_test::TempDir dir_;
};

}  // namespace jni_test

#endif
