/* Calls of the engine's C interface made from a C translation unit, so that
 * the header is compiled as C and the functions are reached by C linkage. */
#ifndef TAVOW3_TESTS_FIREWALL_ENGINE_C_CALLS_H_
#define TAVOW3_TESTS_FIREWALL_ENGINE_C_CALLS_H_

#ifdef __cplusplus
extern "C" {
#endif

/* TAVOW3_Engine_Release(NULL). */
void CReleaseNull(void);
/* A new handle; its RegenAll results go to results[0], results[1]; released. */
void CRegenTwice(int results[2]);
/* TAVOW3_Fw_RegenAll(). */
int CRegenTemporary(void);

#ifdef __cplusplus
}
#endif

#endif /* TAVOW3_TESTS_FIREWALL_ENGINE_C_CALLS_H_ */
