// Owning pointers for the OpenSSL objects the KMIP library uses, and the
// conversion of OpenSSL's error queue into a reason text.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ssl/openssl_ptr.h"

namespace Qlc {

using Kestrel::Common::Ssl::BioPtr;
using Kestrel::Common::Ssl::SslCtxPtr;
using Kestrel::Common::Ssl::SslPtr;
using Kestrel::Common::Ssl::X509Ptr;
using Kestrel::Common::Ssl::X509StorePtr;
using PkeyPtr = Kestrel::Common::Ssl::EvpPkeyPtr;

// Empties the calling thread's OpenSSL error queue and returns its entries
// as one text ("" when empty), most recent last.
inline std::string TakeOpensslErrors() { return Kestrel::Common::Ssl::TakeErrorText(""); }

// Reads every certificate of a PEM text (one or a bundle). Empty when the text
// holds none or any of them is damaged.
std::vector<X509Ptr> ReadPemCertificates(std::string_view pem);

// Reads an unencrypted private key from PEM text; null when there is none.
// Never prompts for a passphrase.
PkeyPtr ReadPemPrivateKey(std::string_view pem);

// The PEM text of a certificate ("" on failure).
std::string CertificateToPem(X509* cert);

}  // namespace Qlc
