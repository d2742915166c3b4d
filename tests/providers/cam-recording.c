/* SPDX-License-Identifier: Apache-2.0 */
/* Has every entry, and writes down what reaches it. */
#include "CAMRecording.h"

#include <stdio.h>
#include <string.h>

CAMRecording camRecording;

static void Write(char const* text) {
    size_t const used = strlen(camRecording.log);
    (void)snprintf(camRecording.log + used, sizeof camRecording.log - used, "%s", text);
}

static void Text(char const* text) {
    Write(text == NULL ? " (null)" : " '");
    if (text != NULL) {
        Write(text);
        Write("'");
    }
}

static void Number(int number) {
    char text[16];
    (void)snprintf(text, sizeof text, " '%d'", number); /* it always fits */
    Write(text);
}

static int End(void) {
    Write("\n");
    ++camRecording.calls;
    return camRecording.failingCall == 0 || camRecording.failingCall == camRecording.calls
               ? camRecording.code
               : TSLAUTH_CAM_PROVIDER_SUCCESS;
}

static int GetDomainInformation(char const* server, int verifyCertificate, char const* thumbprint,
                                char** netBIOSDomainName, char** dnsDomainName, char** domainSID) {
    Write("2");
    Text(server);
    Number(verifyCertificate);
    Text(thumbprint);
    camRecording.slotsWereNull =
        *netBIOSDomainName == NULL && *dnsDomainName == NULL && *domainSID == NULL;
    if (camRecording.numbered) {
        static char numbers[][2] = {"1", "2", "3", "4", "5", "6", "7", "8", "9"};
        *netBIOSDomainName = *dnsDomainName = *domainSID = numbers[camRecording.calls % 9];
        return End();
    }
    *netBIOSDomainName = camRecording.netBIOSDomainName;
    *dnsDomainName = camRecording.dnsDomainName;
    *domainSID = camRecording.domainSID;
    return End();
}

static int CreateMachineAccount(char const* server, char const* accountName,
                                char const* organisationalUnit, int verifyCertificate,
                                char const* thumbprint, char** firstResult, char** secondResult) {
    Write("3");
    Text(server);
    Text(accountName);
    Text(organisationalUnit);
    Number(verifyCertificate);
    Text(thumbprint);
    camRecording.slotsWereNull = *firstResult == NULL && *secondResult == NULL;
    *firstResult = camRecording.firstResult;
    *secondResult = camRecording.secondResult;
    return End();
}

/* By position, so that an entry that moves is an entry that fails. The first word is one that no
 * version would be accepted with, were it read. */
CAMProxyClientOperationsRecord const CAMProxyClientOperations = {INT32_MAX, GetDomainInformation,
                                                                 CreateMachineAccount};
