/*
 * KMIP client library: sessions to a KMIP 1.1 key server over TLS, described
 * by a session-description text, and commands given as printf-style texts.
 *
 *   qlc_session* session = NULL;
 *   qlc_result* r = qlc_connect_key_manager(&session, description);
 *   if (qlc_ok(r) != 0) { log(qlc_explain(r)); ... }
 *   qlc_release(r);
 *   r = qlc_perform(session, "Get, Object, Id=%s", id);
 *   unsigned char* key; int len;
 *   if (qlc_ok(r) == 0 && qlc_value_of("Symmetric_Key/Key", r, "bs", &key, &len) == 0) {
 *     ...; qlc_free(key);
 *   }
 *   qlc_release(r);
 *   qlc_disconnect_key_manager(session);
 *
 * Session description: see platform/kmip/session_description.h. The server
 * is verified against exactly the Trusted_Cert certificates (never a system
 * store). A trusted certificate may be the server's own certificate; when the
 * trust comes from a CA instead, the server's certificate must also name the
 * description's Host (DNS name or IP address). Only TLS 1.2 and later are
 * spoken; the client certificate of the description is presented when asked.
 * The description's Timeout bounds, each on its own, the connect (including
 * the proxy exchange), the TLS handshake, the sending of a request and the
 * receiving of its response.
 *
 * Commands: "Query, Versions"; "Get, Object, Id=%s"; "Get, Attributes,
 * Id=%s, Names=State"; each optionally followed by
 * ", Options={Authentication={User=%s, Password=%s}}". Conversions (%s, %d,
 * %i, %u with l, ll or z, and %%) are filled from the arguments; argument
 * texts are taken verbatim and may contain any character.
 *
 * Response paths: "Versions" (present when the server named at least one
 * version) and "Versions/" (the first version; walk on with qlc_next), each a
 * text "major.minor"; "Symmetric_Key/Key" (bytes), "Symmetric_Key/Length",
 * "Symmetric_Key/Algorithm", "Symmetric_Key/Format", "Object_Type",
 * "Unique_Identifier"; "Attributes/State" (integer) and "Attributes/<Name>"
 * for other attributes, blanks in the name written as '_'.
 *
 * Ownership: every result from connect or perform must be released with
 * qlc_release (NULL is accepted). Nodes belong to their result and are valid
 * until it is released. Texts and bytes from qlc_value_of are copies owned by
 * the caller and freed with qlc_free, which overwrites them first. The server
 * credential record is freed with qlc_free_credentials. The description text
 * and argument texts are not kept after the call returns.
 *
 * Threads: functions may be called from any thread; one session, and one
 * result with its nodes, must not be used by two threads at once. Distinct
 * sessions are independent. No signal handlers are installed, and writes to
 * a closed connection never raise SIGPIPE.
 *
 * Secrets: private keys, passwords and key bytes are kept in buffers that are
 * overwritten before release, and no explanation ever contains them.
 */
#ifndef ZYRD_PLATFORM_KMIP_QLKMIPSIMPLE_H
#define ZYRD_PLATFORM_KMIP_QLKMIPSIMPLE_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Error numbers returned by qlc_ok, qlc_value_of and
 * qlc_fetch_server_credentials. */
#define QLC_OK 0
/* Communication failure: name not resolved, connection refused or reset,
 * closed early, proxy refused the tunnel, TLS handshake failed (for example
 * the server rejected the client certificate), session no longer usable. */
#define QLC_E_COMMUNICATION 75
/* The description's time-out passed while connecting, in the TLS handshake,
 * or while sending a request or waiting for its response. */
#define QLC_E_TIMEOUT 105
/* The server's certificate is not trusted (not verifiable against the
 * Trusted_Cert items, or it does not name the host when trusted through a
 * CA). qlc_fetch_server_credentials on this connect result gives the
 * certificate the server presented. */
#define QLC_E_UNTRUSTED_SERVER 110
/* The library's own numbers. */
#define QLC_E_BAD_DESCRIPTION 1001    /* session description cannot be parsed */
#define QLC_E_BAD_COMMAND 1002        /* command text or its arguments invalid */
#define QLC_E_BAD_ARGUMENT 1003       /* null or wrong handle, unknown format */
#define QLC_E_NOT_FOUND 1004          /* no node at that path */
#define QLC_E_WRONG_TYPE 1005         /* the node cannot be read in that format */
#define QLC_E_MALFORMED_RESPONSE 1006 /* truncated, oversized or invalid TTLV */
#define QLC_E_OPERATION_FAILED                 \
  1007 /* the server's result status was not   \
          Success; the explanation carries the \
          status, result reason and message */
#define QLC_E_BAD_CERTIFICATE                                                \
  1008                                   /* client certificate, its key or a \
                                            trusted certificate cannot be used */
#define QLC_E_NO_SERVER_CREDENTIALS 1009 /* the result holds no server cert */
#define QLC_E_RESOURCES 1010             /* out of memory or another local failure */

/* Certificate format codes of qlc_server_credentials. */
#define QLC_CERT_FORMAT_PEM                                             \
  1                           /* one X.509 certificate as PEM text (the \
                                 only format this library produces) */
#define QLC_CERT_FORMAT_DER 2 /* one X.509 certificate, DER bytes */
#define QLC_CERT_FORMAT_PEM_CHAIN              \
  4 /* PEM text of the certificate followed by \
       its chain */

typedef struct qlc_session qlc_session;
/* Results and nodes share one handle type, so that qlc_value_of and qlc_find
 * accept either. */
typedef struct qlc_handle qlc_result;
typedef struct qlc_handle qlc_node;

typedef struct qlc_server_credentials {
  int32_t format;            /* QLC_CERT_FORMAT_* */
  const unsigned char* data; /* the certificate; for PEM also NUL-terminated */
  uint32_t length;           /* bytes in data, without the NUL */
} qlc_server_credentials;

/* Opens a session as the description says. Always returns a result (NULL
 * only when out of memory, which qlc_ok reports as QLC_E_RESOURCES). When
 * qlc_ok of it is 0, *session holds the open session; otherwise *session is
 * set to NULL. The variable arguments are accepted and ignored: the
 * description is taken literally. */
qlc_result* qlc_connect_key_manager(qlc_session** session, const char* description, ...);

/* 0 when the call that made the result succeeded, else its error number. */
int qlc_ok(const qlc_result* result);

/* Why the call failed, as NUL-terminated text valid until the result is
 * released or used again. For a successful result: why the last look-up in
 * it failed, or "". Never NULL. */
const char* qlc_explain(const qlc_result* result);

void qlc_release(qlc_result* result);

/* Closes the session (TLS close, socket closed) and frees it. NULL is fine. */
void qlc_disconnect_key_manager(qlc_session* session);

/* Sends one command and waits for its response. A session whose exchange
 * broke off (time-out, malformed response, closed connection) fails every
 * later command with QLC_E_COMMUNICATION. */
qlc_result* qlc_perform(qlc_session* session, const char* command, ...);

/* Reads the value at `path` below `from` (a result or a node; path NULL or
 * "" for `from` itself). Formats:
 *   "d"   int*                          integer or enumeration
 *   "bs"  unsigned char**, int*         bytes (or text without its NUL)
 *   "%s"  char**                        text, or an integer in decimal
 * Returns 0 and fills the out places, or an error number and leaves them
 * alone (the reason is then what qlc_explain of the owning result says). */
int qlc_value_of(const char* path, const qlc_handle* from, const char* format, ...);

/* The node at `path` below a result or node, or NULL. */
const qlc_node* qlc_find(const char* path, const qlc_handle* from);

/* The node after `node` among its siblings, or NULL. */
const qlc_node* qlc_next(const qlc_node* node);

/* Overwrites and frees a text or byte buffer from qlc_value_of. NULL is fine;
 * pass only pointers that qlc_value_of handed out, each once. */
void qlc_free(void* pointer);

/* For a connect result that failed with QLC_E_UNTRUSTED_SERVER: sets
 * *credentials to a new record with the server's certificate (format 1, PEM)
 * and returns 0. Otherwise returns QLC_E_NO_SERVER_CREDENTIALS (or
 * QLC_E_BAD_ARGUMENT) and sets *credentials to NULL. */
int qlc_fetch_server_credentials(const qlc_result* result, qlc_server_credentials** credentials);

void qlc_free_credentials(qlc_server_credentials* credentials);

#ifdef __cplusplus
}
#endif

#endif /* ZYRD_PLATFORM_KMIP_QLKMIPSIMPLE_H */
