// SPDX-License-Identifier: Apache-2.0
// Helpers for the tests of the Java-facing layer: a minimal JNI environment for calling the native
// methods without a JVM (Java strings and arrays are test-owned objects, and every obtain/release
// is counted so a test can check the pairing), the Java entry points, PCM source files and the
// registry's log lines.
#ifndef KOVA_TESTS_JNI_TEST_SUPPORT_H
#define KOVA_TESTS_JNI_TEST_SUPPORT_H

#include <gtest/gtest.h>
#include <jni.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <string>
#include <vector>

#include "jni/jni_entries.h"
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

// Elements are handed out as a separate copy, as a VM may do, so only a release with mode 0
// makes the native side's writes visible in the array.
template <typename T, typename A>
T* get_elements(JNIEnv*, A a, jboolean*) {
    g_got++;
    const auto& items = static_cast<Array<T>*>(reinterpret_cast<ArrayBase*>(a))->items;
    T* copy = new T[items.size() + 1];
    std::copy(items.begin(), items.end(), copy);
    return copy;
}
template <typename T, typename A>
void release_elements(JNIEnv*, A a, T* elems, jint mode) {
    g_released++;
    auto& items = static_cast<Array<T>*>(reinterpret_cast<ArrayBase*>(a))->items;
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
        t.GetArrayLength = [](JNIEnv*, jarray a) {
            return reinterpret_cast<ArrayBase*>(a)->length;
        };
        t.GetByteArrayElements = get_elements<jbyte, jbyteArray>;
        t.ReleaseByteArrayElements = release_elements<jbyte, jbyteArray>;
        t.GetFloatArrayElements = get_elements<jfloat, jfloatArray>;
        t.ReleaseFloatArrayElements = release_elements<jfloat, jfloatArray>;
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

// A static native method of the Java class called as the VM would, e.g. JAVA(set_1src, id, 1).
#define JAVA(method, ...) \
    Java_com_corvane_audio_Kova_##method(fake_jni::env(), nullptr, __VA_ARGS__)

namespace jni_test {

inline jlong init_default() {
    return JAVA(init, 48000, 2, 1, 1080, 2280);
}
inline jint deinit(jlong id) {
    return JAVA(deinit, id);
}

// Three raw 16-bit stereo PCM sounds (start, loop, end) in a folder of their own: quiet sines
// that stay far from clipping after every gain stage; as Java strings and as C paths.
struct Sounds {
    explicit Sounds(size_t start = 9600, size_t loop = 192000, size_t end = 9600) {
        const size_t bytes[3] = {start, loop, end};
        for (int s = 0; s < 3; ++s) {
            std::vector<int16_t> v(bytes[s] / 2);
            for (size_t i = 0; i < v.size(); ++i) {
                v[i] = static_cast<int16_t>(400 * std::sin(M_PI * (s + 1) * double(i / 2) / 109));
            }
            str[s].utf = dir.write("s" + std::to_string(s) + ".pcm", v);
            path[s] = str[s].utf.c_str();
        }
    }
    kova_test::TempDir dir;
    fake_jni::String str[3];
    const char* path[3];
};

// Registers the three sounds as a set of instance `id`.
inline jint reg(jlong id, Sounds& s) {
    using fake_jni::jstr;
    return JAVA(reg_1src_1byfiles, id, jstr(s.str[0]), jstr(s.str[1]), jstr(s.str[2]));
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
using Lines = std::vector<std::string>;

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

}  // namespace jni_test

#endif
