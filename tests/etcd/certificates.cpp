// SPDX-License-Identifier: Apache-2.0
// "openssl ca" is the one form of the tool that takes both dates of a certificate.
#include "certificates.h"

#include <stdexcept>
#include <vector>

#include "process.h"
#include "temp_folder.h"

namespace Test {

namespace fs = std::filesystem;

namespace {

void openssl(const fs::path &folder, const std::vector<std::string> &arguments) {
  Command command;
  command.program = "/usr/bin/openssl";
  command.arguments = arguments;
  command.workingFolder = folder;
  const ProcessResult result = run(command);
  if (result.status != 0) throw std::runtime_error("openssl: " + result.out + result.err);
}

const std::vector<std::string> kNewKey = {"-newkey", "ec", "-pkeyopt",
                                          "ec_paramgen_curve:prime256v1", "-nodes"};

void request(const fs::path &folder, const std::string &name, std::vector<std::string> more) {
  std::vector<std::string> arguments = {"req",        "-config", "openssl.cnf", "-subj",
                                        "/O=" + name, "-keyout", name + ".key"};
  arguments.insert(arguments.end(), kNewKey.begin(), kNewKey.end());
  arguments.insert(arguments.end(), more.begin(), more.end());
  openssl(folder, arguments);
}

}  // namespace

Authority::Authority(const fs::path &folder, const std::string &name) : folder_(folder / name) {
  fs::create_directory(folder_);
  writeFile(folder_ / "index.txt", "");
  writeFile(folder_ / "serial", "01\n");
  writeFile(folder_ / "openssl.cnf",
            "[req]\ndistinguished_name = dn\n[dn]\n"
            "[ca]\ndefault_ca = own\n"
            "[own]\ndatabase = index.txt\nserial = serial\nnew_certs_dir = .\n"
            "certificate = ca.crt\nprivate_key = authority.key\ndefault_md = sha256\n"
            "policy = anything\nunique_subject = no\nrand_serial = yes\n"
            "[anything]\norganizationName = supplied\n"
            "[authority]\nbasicConstraints = critical,CA:TRUE\nsubjectKeyIdentifier = hash\n"
            "keyUsage = critical,keyCertSign,cRLSign\n");
  request(folder_, "authority",
          {"-x509", "-days", "2", "-extensions", "authority", "-out", "ca.crt"});
}

std::string Authority::cert() const {
  return folder_ / "ca.crt";
}

Certificate Authority::issue(const std::string &name, const std::string &address,
                             Validity validity) const {
  writeFile(folder_ / (name + ".ext"),
            "subjectAltName = IP:" + address +
                "\nbasicConstraints = CA:FALSE\nkeyUsage = digitalSignature\n"
                "extendedKeyUsage = serverAuth,clientAuth\nauthorityKeyIdentifier = keyid\n");
  request(folder_, name, {"-new", "-out", name + ".csr"});
  std::vector<std::string> sign = {"ca",       "-config",     "openssl.cnf", "-batch",
                                   "-in",      name + ".csr", "-out",        name + ".crt",
                                   "-extfile", name + ".ext", "-notext"};
  const std::vector<std::string> dates =
      validity == Validity::kNow ? std::vector<std::string>{"-days", "2"}
                                 : std::vector<std::string>{"-startdate", "20200101000000Z",
                                                            "-enddate", "20200102000000Z"};
  sign.insert(sign.end(), dates.begin(), dates.end());
  openssl(folder_, sign);
  return {folder_ / (name + ".crt"), folder_ / (name + ".key")};
}

}  // namespace Test
