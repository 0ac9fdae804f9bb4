// A provider's trust material in the configuration store: the KMIP
// credential, the client certificate and its private key, the pending client
// CSR and its private key, and the trusted key-server certificates.
//
// The material is stored and returned as opaque strings, exactly as handed
// in; nothing here validates or standardises it. Each function looks the
// provider up (provider_config.h), reads or changes one record and commits
// a change by updating the provider object in one transaction. Results are
// store status codes: 0 success, 2 store failure or missing value, 3 the
// provider, its "key_server" or its "kmip_server" does not exist.
//
// No function throws: a store exception, also a stored value of another
// type than the record's, is logged and gives 2. No function takes
// "configLock"; callers that change material hold it for write.
#pragma once

#include <string>
#include <vector>

namespace Zyrd::Config {

// Copies the credential into `credential`; left as it was when none is set.
int GetCredential(const std::string& provider, std::string& credential);
int SetCredential(const std::string& provider, const std::string& credential);

// Without a client certificate, `certificate` becomes empty (and
// `privateKey` is left as it was). A certificate without a key gives 2.
int GetClientCertificate(const std::string& provider, std::string& certificate,
                         std::string& privateKey);
int SetClientCertificate(const std::string& provider, const std::string& certificate,
                         const std::string& privateKey);

// Without a CSR both outputs are left as they were; so is either one whose
// value is missing.
int GetClientCsr(const std::string& provider, std::string& csr, std::string& privateKey);
int SetClientCsr(const std::string& provider, const std::string& csr,
                 const std::string& privateKey);

// Appends the stored certificates, in stored order; nothing when none were
// ever set.
int GetServerCertificates(const std::string& provider, std::vector<std::string>& certificates);
// Replaces the whole list (an empty list stores an empty list).
int SetServerCertificates(const std::string& provider,
                          const std::vector<std::string>& certificates);

}  // namespace Zyrd::Config
