// SPDX-License-Identifier: Apache-2.0
/* Stand-in for p7zip's 7z.so in AArch64 test runs under qemu-user.
 *
 * Debian's AOSP libbacktrace (pulled in by libutils) needs 7z.so, which exists only for the host
 * architecture (p7zip-full cannot be installed for two architectures at once). libbacktrace
 * calls these only to unpack compressed debug sections while symbolising a backtrace, which the
 * library and its tests never do; each entry point reports failure. */
void CrcGenerateTable(void) {}
void Crc64GenerateTable(void) {}
void XzUnpacker_Construct(void* p, void* alloc) {
    (void)p;
    (void)alloc;
}
void XzUnpacker_Free(void* p) { (void)p; }
int XzUnpacker_Code(void) { return 1; /* SZ_ERROR_DATA: nothing is ever unpacked */ }
int XzUnpacker_IsStreamWasFinished(const void* p) {
    (void)p;
    return 0;
}
