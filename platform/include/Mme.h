/*
 * The closed media engine (libmme_jrtc) as a whole: start and stop,
 * configuration, version and provisioning values.
 */
#ifndef QUELLBORN_PLATFORM_MME_H
#define QUELLBORN_PLATFORM_MME_H

#ifdef __cplusplus
extern "C" {
#endif

int Mme_Start(void);
int Mme_Stop(void);
int Mme_CfgSetDumpDebug(int bEnable);
int Mme_CfgSetPrintDebug(int bEnable);
int Mme_CfgSetCfgDir(const char* pcDir);
int Mme_CfgSetLogDir(const char* pcDir);
int Mme_CfgSetLogLevel(unsigned int iLevel);
int Mme_CfgSetLogLevelX(unsigned int iLevel);
/* Texts returned here belong to the engine. */
const char* Mme_GetVer(void);
int Mme_ProvGetValueBool(const char* pcKey);
int Mme_ProvGetValueInt(const char* pcKey);
int Mme_ProvGetValueEnum(const char* pcKey);
const char* Mme_ProvGetValueStr(const char* pcKey);
const char* Mme_ProvGetMapStr(const char* pcKey, int iIndex);

/* Version of the engine's base library. */
const char* Melon_GetVersion(void);

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_MME_H */
