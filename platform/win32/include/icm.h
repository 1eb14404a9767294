/* The Image Color Management (mscms) declarations the plugin uses, for Linux builds.
 *
 * Layouts and values follow the Windows SDK. COLOR holds a pointer among its members, as
 * the SDK's does: 8 bytes on 32-bit platforms, 16 on 64-bit ones. A colour's data take
 * the first 8 bytes; TranslateColors never writes past them. Four-character codes are
 * written as hex values ('mntr' is 0x6D6E7472). */
#ifndef TINTWELL_WIN32_ICM_H
#define TINTWELL_WIN32_ICM_H

#include "windows.h"

#ifdef __cplusplus
extern "C" {
#endif

#define MAX_COLOR_CHANNELS 8

struct GRAYCOLOR { WORD gray; };
struct RGBCOLOR { WORD red; WORD green; WORD blue; };
struct CMYKCOLOR { WORD cyan; WORD magenta; WORD yellow; WORD black; };
struct XYZCOLOR { WORD X; WORD Y; WORD Z; };
struct YxyCOLOR { WORD Y; WORD x; WORD y; };
struct LabCOLOR { WORD L; WORD a; WORD b; };
struct GENERIC3CHANNEL { WORD ch1; WORD ch2; WORD ch3; };
struct NAMEDCOLOR { DWORD dwIndex; };
struct HiFiCOLOR { BYTE channel[MAX_COLOR_CHANNELS]; };

typedef union tagCOLOR {
  struct GRAYCOLOR gray;
  struct RGBCOLOR rgb;
  struct CMYKCOLOR cmyk;
  struct XYZCOLOR XYZ;
  struct YxyCOLOR Yxy;
  struct LabCOLOR Lab;
  struct GENERIC3CHANNEL gen3ch;
  struct NAMEDCOLOR named;
  struct HiFiCOLOR hifi;
  struct {
    DWORD reserved1;
    VOID* reserved2;
  };
} COLOR;
typedef COLOR *PCOLOR, *LPCOLOR;

typedef enum {
  COLOR_GRAY = 1,
  COLOR_RGB,
  COLOR_XYZ,
  COLOR_Yxy,
  COLOR_Lab,
  COLOR_3_CHANNEL,
  COLOR_CMYK,
  COLOR_5_CHANNEL,
  COLOR_6_CHANNEL,
  COLOR_7_CHANNEL,
  COLOR_8_CHANNEL,
  COLOR_NAMED
} COLORTYPE;
typedef COLORTYPE *PCOLORTYPE, *LPCOLORTYPE;

typedef enum {
  BM_x555RGB = 0x0000,
  BM_x555XYZ = 0x0101,
  BM_x555Yxy,
  BM_x555Lab,
  BM_x555G3CH,
  BM_RGBTRIPLETS = 0x0002,
  BM_BGRTRIPLETS = 0x0004,
  BM_XYZTRIPLETS = 0x0201,
  BM_YxyTRIPLETS,
  BM_LabTRIPLETS,
  BM_G3CHTRIPLETS,
  BM_5CHANNEL,
  BM_6CHANNEL,
  BM_7CHANNEL,
  BM_8CHANNEL,
  BM_GRAY,
  BM_xRGBQUADS = 0x0008,
  BM_xBGRQUADS = 0x0010,
  BM_xG3CHQUADS = 0x0304,
  BM_KYMCQUADS,
  BM_CMYKQUADS = 0x0020,
  BM_10b_RGB = 0x0009,
  BM_10b_XYZ = 0x0401,
  BM_10b_Yxy,
  BM_10b_Lab,
  BM_10b_G3CH,
  BM_NAMED_INDEX,
  BM_16b_RGB = 0x000A,
  BM_16b_XYZ = 0x0501,
  BM_16b_Yxy,
  BM_16b_Lab,
  BM_16b_G3CH,
  BM_16b_GRAY,
  BM_565RGB = 0x0001
} BMFORMAT;
typedef BMFORMAT *PBMFORMAT, *LPBMFORMAT;

typedef BOOL(WINAPI* PBMCALLBACKFN)(ULONG, ULONG, LPARAM);
typedef PBMCALLBACKFN LPBMCALLBACKFN;

typedef struct tagPROFILEHEADER {
  DWORD phSize;
  DWORD phCMMType;
  DWORD phVersion;
  DWORD phClass;
  DWORD phDataColorSpace;
  DWORD phConnectionSpace;
  DWORD phDateTime[3];
  DWORD phSignature;
  DWORD phPlatform;
  DWORD phProfileFlags;
  DWORD phManufacturer;
  DWORD phModel;
  DWORD phAttributes[2];
  DWORD phRenderingIntent;
  CIEXYZ phIlluminant;
  DWORD phCreator;
  BYTE phReserved[44];
} PROFILEHEADER;
typedef PROFILEHEADER *PPROFILEHEADER, *LPPROFILEHEADER;

#define CLASS_MONITOR 0x6D6E7472    /* 'mntr' */
#define CLASS_PRINTER 0x70727472    /* 'prtr' */
#define CLASS_SCANNER 0x73636E72    /* 'scnr' */
#define CLASS_LINK 0x6C696E6B       /* 'link' */
#define CLASS_ABSTRACT 0x61627374   /* 'abst' */
#define CLASS_COLORSPACE 0x73706163 /* 'spac' */
#define CLASS_NAMED 0x6E6D636C      /* 'nmcl' */

#define SPACE_XYZ 0x58595A20       /* 'XYZ ' */
#define SPACE_Lab 0x4C616220       /* 'Lab ' */
#define SPACE_Luv 0x4C757620       /* 'Luv ' */
#define SPACE_YCbCr 0x59436272     /* 'YCbr' */
#define SPACE_Yxy 0x59787920       /* 'Yxy ' */
#define SPACE_RGB 0x52474220       /* 'RGB ' */
#define SPACE_GRAY 0x47524159      /* 'GRAY' */
#define SPACE_HSV 0x48535620       /* 'HSV ' */
#define SPACE_HLS 0x484C5320       /* 'HLS ' */
#define SPACE_CMYK 0x434D594B      /* 'CMYK' */
#define SPACE_CMY 0x434D5920       /* 'CMY ' */
#define SPACE_2_CHANNEL 0x32434C52 /* '2CLR' */
#define SPACE_3_CHANNEL 0x33434C52 /* '3CLR' */
#define SPACE_4_CHANNEL 0x34434C52 /* '4CLR' */
#define SPACE_5_CHANNEL 0x35434C52 /* '5CLR' */
#define SPACE_6_CHANNEL 0x36434C52 /* '6CLR' */
#define SPACE_7_CHANNEL 0x37434C52 /* '7CLR' */
#define SPACE_8_CHANNEL 0x38434C52 /* '8CLR' */

#define FLAG_EMBEDDEDPROFILE 0x00000001
#define FLAG_DEPENDENTONDATA 0x00000002

#define ATTRIB_TRANSPARENCY 0x00000001
#define ATTRIB_MATTE 0x00000002

#define INTENT_PERCEPTUAL 0
#define INTENT_RELATIVE_COLORIMETRIC 1
#define INTENT_SATURATION 2
#define INTENT_ABSOLUTE_COLORIMETRIC 3

typedef struct tagPROFILE {
  DWORD dwType;
  PVOID pProfileData;
  DWORD cbDataSize;
} PROFILE;
typedef PROFILE *PPROFILE, *LPPROFILE;

#define PROFILE_FILENAME 1
#define PROFILE_MEMBUFFER 2

#define PROFILE_READ 1
#define PROFILE_READWRITE 2

typedef HANDLE HPROFILE;
typedef HPROFILE* PHPROFILE;
typedef HANDLE HTRANSFORM;

#define INDEX_DONT_CARE 0
#define CMM_FROM_PROFILE INDEX_DONT_CARE
#define CMM_WINDOWS_DEFAULT 0x57696E20 /* 'Win ' */

typedef DWORD TAGTYPE;
typedef TAGTYPE *PTAGTYPE, *LPTAGTYPE;

#define PROOF_MODE 0x00000001
#define NORMAL_MODE 0x00000002
#define BEST_MODE 0x00000003
#define ENABLE_GAMUT_CHECKING 0x00010000
#define USE_RELATIVE_COLORIMETRIC 0x00020000
#define FAST_TRANSLATE 0x00040000

HPROFILE WINAPI OpenColorProfileA(PPROFILE pProfile, DWORD dwDesiredAccess, DWORD dwShareMode,
                                  DWORD dwCreationMode);
BOOL WINAPI CloseColorProfile(HPROFILE hProfile);
BOOL WINAPI IsColorProfileValid(HPROFILE hProfile, PBOOL pbValid);
BOOL WINAPI GetColorProfileHeader(HPROFILE hProfile, PPROFILEHEADER pHeader);
BOOL WINAPI SetColorProfileHeader(HPROFILE hProfile, PPROFILEHEADER pHeader);
BOOL WINAPI GetCountColorProfileElements(HPROFILE hProfile, PDWORD pnCount);
BOOL WINAPI GetColorProfileElementTag(HPROFILE hProfile, DWORD dwIndex, PTAGTYPE pTag);
BOOL WINAPI IsColorProfileTagPresent(HPROFILE hProfile, TAGTYPE tag, PBOOL pbPresent);
BOOL WINAPI GetColorProfileElement(HPROFILE hProfile, TAGTYPE tag, DWORD dwOffset, PDWORD pcbElement,
                                   PVOID pElement, PBOOL pbReference);
BOOL WINAPI SetColorProfileElementSize(HPROFILE hProfile, TAGTYPE tagType, DWORD pcbElement);
BOOL WINAPI SetColorProfileElement(HPROFILE hProfile, TAGTYPE tag, DWORD dwOffset, PDWORD pcbElement,
                                   PVOID pElement);
BOOL WINAPI SetColorProfileElementReference(HPROFILE hProfile, TAGTYPE newTag, TAGTYPE refTag);
BOOL WINAPI GetColorDirectoryA(PCSTR pMachineName, PSTR pBuffer, PDWORD pdwSize);
BOOL WINAPI InstallColorProfileA(PCSTR pMachineName, PCSTR pProfileName);
BOOL WINAPI UninstallColorProfileA(PCSTR pMachineName, PCSTR pProfileName, BOOL bDelete);

HTRANSFORM WINAPI CreateMultiProfileTransform(PHPROFILE pahProfiles, DWORD nProfiles, PDWORD padwIntent,
                                              DWORD nIntents, DWORD dwFlags, DWORD indexPreferredCMM);
BOOL WINAPI DeleteColorTransform(HTRANSFORM hColorTransform);
BOOL WINAPI TranslateColors(HTRANSFORM hColorTransform, PCOLOR paInputColors, DWORD nColors,
                            COLORTYPE ctInput, PCOLOR paOutputColors, COLORTYPE ctOutput);
BOOL WINAPI CheckColors(HTRANSFORM hColorTransform, PCOLOR paInputColors, DWORD nColors,
                        COLORTYPE ctInput, PBYTE paResult);
BOOL WINAPI TranslateBitmapBits(HTRANSFORM hColorTransform, PVOID pSrcBits, BMFORMAT bmInput,
                                DWORD dwWidth, DWORD dwHeight, DWORD dwInputStride, PVOID pDestBits,
                                BMFORMAT bmOutput, DWORD dwOutputStride, PBMCALLBACKFN pfnCallBack,
                                LPARAM ulCallbackData);
BOOL WINAPI CreateDeviceLinkProfile(PHPROFILE hProfile, DWORD nProfiles, PDWORD padwIntent,
                                    DWORD nIntents, DWORD dwFlags, PBYTE* pProfileData,
                                    DWORD indexPreferredCMM);

#ifdef __cplusplus
}
#endif

#endif
