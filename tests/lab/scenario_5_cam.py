# SPDX-License-Identifier: Apache-2.0
"""Hosts join with a one-time code, through a service next to the controller; no host ever holds
anybody's credentials."""
import concurrent.futures
import json
import re
import subprocess

from lab import LogIn, PASSWORD, TREE, expect, expect_equal, until

TITLE = "Joining without credentials on the host, through the CAM service"

SERVICE = f"{TREE}/cam-service/tslauth-cam-service"
CONFIGURATION = "/run/cam/service.toml"
SERVER, IMPOSTOR = "10.99.0.1", "10.99.0.2"
# The account that the service makes accounts with: no user of the lab has its password.
SERVICE_USER, SERVICE_PASSWORD = "cam-service", "Only-the-serv1ce-has-it"
CODE = "/etc/tessel/tslauth/winbind-cam.code"
AUTHORITY = "/etc/tessel/tslauth/winbind-cam-ca.pem"
UNIT = "OU=Linux,OU=Servers,DC=corp,DC=example"
FAKETIME = "/usr/lib/x86_64-linux-gnu/faketime/libfaketime.so.1"

REFUSED, UNREACHABLE = 4, 8
UNTRUSTED = ("InvalidCAMCertificateException",
             "Exception 0x80090325: The CAM server's certificate cannot be verified.")
UNREACHED = ("ConnectionRefusedException",
             "Exception 0x000004c9: The remote computer refused the network connection.")
SILENT = ("WSATimedOutException",
          "Exception 0x0000274c: A connection attempt failed because the connected party did not "
          "properly respond after a period of time, or established connection failed because "
          "connected host has failed to respond.")


def unknown(code):
    return "UnknownException", f"Exception 0x{code:08x}: Unknown exception"


NO_CODE, CODE_REFUSED, JOINED_ALREADY = unknown(2), unknown(5), unknown(2691)


# --- the service's side --------------------------------------------------------------------------

def make_certificates(dc1):
    """An authority of the lab's own, which signs the service's certificate; and an impostor's."""
    dc1.shell("""
        mkdir -p -m 0700 /run/cam
        cd /run/cam
        key() { openssl ecparam -name prime256v1 -genkey -noout -out "$1"; }
        key ca.key; key service.key; key impostor.key
        openssl req -x509 -new -key ca.key -subj '/CN=The lab' -days 2 -out ca.pem
        openssl req -new -key service.key -subj /CN=cam -out service.csr
        openssl x509 -req -in service.csr -CA ca.pem -CAkey ca.key -CAcreateserial -days 2 \
            -extfile <(echo "subjectAltName=IP:$1") -out service.pem
        openssl req -x509 -new -key impostor.key -subj /CN=cam -days 2 \
            -addext "subjectAltName=IP:$2" -out impostor.pem
        """, SERVER, IMPOSTOR)


def make_account(dc1):
    """What the service's README.md tells an administrator: an account that may make computers in
    one unit, and nothing else."""
    if dc1.directory(f"(sAMAccountName={SERVICE_USER})", "cn"):
        return  # of an earlier play in the same lab
    dc1.samba_tool("user", "create", SERVICE_USER, SERVICE_PASSWORD)
    sid = dc1.directory(f"(sAMAccountName={SERVICE_USER})", "objectSid")[0]["objectSid"][0]
    dc1.samba_tool("dsacl", "set", f"--objectdn={UNIT}",
                   f"--sddl=(OA;;CC;bf967a86-0de6-11d0-a285-00aa003049e2;;{sid})")
    dc1.shell("mkdir -p -m 0700 /run/cam-account")
    dc1.write("/run/cam-account/credentials",
              f"username = {SERVICE_USER}\npassword = {SERVICE_PASSWORD}\ndomain = CORP\n", "0600")


def start_service(dc1):
    """The process, whose output is the service's log."""
    log = "/run/cam/log"
    dc1.write(log, "")
    dc1.write(CONFIGURATION, """
state = "/run/cam/state"
[server]
certificate = "/run/cam/service.pem"
key = "/run/cam/service.key"
[domain]
controller = "dc1.corp.example"
credentials = "/run/cam-account/credentials"
default_unit = "Servers/Linux"
""")
    dc1.ok(SERVICE, "check", "--configuration", CONFIGURATION)
    process = dc1.start(
        "bash", "-c", f'exec "$0" "$@" >>{log} 2>&1', SERVICE, "serve",
        "--configuration", CONFIGURATION, stdin=subprocess.DEVNULL)
    until("the service listens", lambda: "serving corp.example" in dc1.read(log), 20)
    return process


def start_impostor(dc1, dc2):
    """A server with a certificate of its own, which takes whatever it is sent."""
    dc2.shell("mkdir -p -m 0700 /run/cam")
    for name in ("impostor.pem", "impostor.key", "service.pem", "service.key"):
        dc2.write(f"/run/cam/{name}", dc1.read(f"/run/cam/{name}"), "0600")
    return serve_as(dc2, "impostor")


def serve_as(dc2, name):
    process = dc2.start(
        "bash", "-c", 'cd /run/cam; exec openssl s_server -quiet -accept 8989 -cert "$0.pem" '
        '-key "$0.key" >heard 2>&1', name, stdin=subprocess.PIPE)
    until("the impostor listens", lambda: dc2.run("bash", "-c", "ss -ltn | grep :8989").code == 0)
    return process


def issue(dc1, host, *options, faketime=None):
    """A one-time code for the host."""
    command = [SERVICE, "issue-code", "--configuration", CONFIGURATION, "--host", host.name,
               *options]
    if faketime:
        command = ["env", f"LD_PRELOAD={FAKETIME}", f"FAKETIME={faketime}", *command]
    code = dc1.ok(*command).out.strip()
    expect(re.fullmatch(r"([A-Z2-9]{4}-){7}[A-Z2-9]{4}", code), f"a code was expected: {code!r}")
    return code


# --- the host's side -----------------------------------------------------------------------------

def set_up_host(host, verify):
    host.write("/etc/tessel/tslauth/camservers.conf", "")
    host.write("/etc/tessel/advanced.conf",
               f'UserVars.ActiveDirectoryVerifyCAMCertificate = "{verify}"\n')


def give(host, code):
    """What the administrator does with the code that the service has printed."""
    host.write(CODE, code + "\n", "0600")


def pin(lab, host, certificate, server=SERVER):
    text = lab.dc1.read(f"/run/cam/{certificate}.pem")
    host.write("/run/server.pem", text)
    host.tslauthctl("cam", "import", server, "/run/server.pem")
    host.shell("rm /run/server.pem")


def join(host, *options, server=SERVER):
    return host.run("tslauthctl", "--json", "join", "--cam", server, *options)


def is_refused(result, told, exit_code=REFUSED):
    expect_equal(result.code, exit_code, f"the exit code of\n{result}\n")
    for part in told:
        expect(f"{part}" in result.out, f"'{part}' was expected\n{result}")


def library_is_refused(result, told):
    expect_equal((result.code, result.out), (1, f"{told[0]}: {told[1]}\n"),
                 "what the library threw")


def knows_no_domain(host):
    expect_equal(host.run("tslauthctl", "info").code, 10, "the exit code of tslauthctl info")


def has_code(host, code):
    expect_equal(host.read(CODE), code + "\n", "the code on the host")


def refusals(lab, host):
    """What does not lead to an account, and keeps the code where it is."""
    code = issue(lab.dc1, host)
    give(host, code)
    with lab.step(f"{host.name}: no certificate is pinned: 0x80090325, no code is sent"):
        is_refused(join(host), UNTRUSTED)
        library_is_refused(host.library("join-cam", SERVER), UNTRUSTED)
        has_code(host, code)
    with lab.step(f"{host.name}: another certificate is pinned: 0x80090325"):
        pin(lab, host, "impostor")
        is_refused(join(host), UNTRUSTED)
        library_is_refused(host.library("join-cam", SERVER), UNTRUSTED)
        has_code(host, code)
    with lab.step(f"{host.name}: cam import pins the thumbprint that openssl prints"):
        pin(lab, host, "service")
        thumbprint = lab.dc1.ok("openssl", "x509", "-in", "/run/cam/service.pem", "-noout",
                                "-fingerprint", "-sha1").out.strip().partition("=")[2]
        expect_equal(host.tslauthctl("cam", "list").out, f"{SERVER} {thumbprint}\n", "the list")
    with lab.step(f"{host.name}: an impostor's certificate: 0x80090325, it hears no code"):
        pin(lab, host, "service", IMPOSTOR)
        is_refused(join(host, server=IMPOSTOR), UNTRUSTED)
        heard = lab.dc2.read("/run/cam/heard")
        expect(code not in heard and code.replace("-", "") not in heard, heard)
    with lab.step(f"{host.name}: tslauthctl cam domain says which domain the service is of"):
        expect("corp.example" in host.tslauthctl("cam", "domain", SERVER).out, "no corp.example")
    host.shell("rm $1", CODE)
    with lab.step(f"{host.name}: no code on the host: code 2"):
        is_refused(join(host), NO_CODE)
    with lab.step(f"{host.name}: a wrong code is refused: code 5"):
        wrong = ("A" if code[0] != "A" else "B") + code[1:]
        give(host, wrong)
        is_refused(join(host), CODE_REFUSED)
        library_is_refused(host.library("join-cam", SERVER), CODE_REFUSED)
    with lab.step(f"{host.name}: an expired code is refused: code 5"):
        give(host, issue(lab.dc1, host, "--valid-for", "30", faketime="-31m"))
        is_refused(join(host), CODE_REFUSED)
    with lab.step(f"{host.name}: it is not joined, and the directory has no account"):
        knows_no_domain(host)
        expect_equal(lab.dc1.account_of(host), None, "the account")


def joins(lab, host, *options):
    """Joins with a fresh code, which is given back."""
    code = issue(lab.dc1, host)
    give(host, code)
    with lab.step(f"{host.name}: tslauthctl join --cam {SERVER}"):
        host.tslauthctl("join", "--cam", SERVER, *options)
    with lab.step(f"{host.name}: the code is gone, the account stands in Servers/Linux"):
        host.exits(1, "test", "-e", CODE)
        expect_equal(lab.dc1.account_of(host, "cn")["dn"].lower(),
                     f"CN={host.name},{UNIT}".lower(), "the account's place")
    with lab.step(f"{host.name}: trust state 0"):
        expect_equal(json.loads(host.tslauthctl("--json", "info").out)["trust_state"], 0,
                     "the trust state")
    return code


def user_logs_in(lab, host):
    host.make_local_users()
    host.tslauthctl("activate", "Active Directory")
    with lab.step(f"{host.name}: CORP\\user1 logs in") as step:
        step.took(LogIn(host, "CORP\\user1", PASSWORD).is_let_in())


def code_counts_once(lab, host, code):
    with lab.step(f"{host.name}: the same code again: code 2691, and the host stays joined"):
        give(host, code)
        library_is_refused(host.library("join-cam", SERVER), JOINED_ALREADY)
        host.shell("rm $1", CODE)
        host.tslauthctl("info")


def code_of_another(lab, host, other):
    with lab.step(f"{host.name}: the code of another host is refused: code 5"):
        give(host, issue(lab.dc1, other))
        is_refused(join(host), CODE_REFUSED)
        host.shell("rm $1", CODE)


def chain(lab, host):
    """Nothing is pinned here: the certificate must be good by itself."""
    give(host, issue(lab.dc1, host))
    with lab.step(f"{host.name}, verifying: an unknown authority: 0x80090325"):
        is_refused(join(host), UNTRUSTED)
    host.write(AUTHORITY, lab.dc1.read("/run/cam/ca.pem"))
    impostor = serve_as(lab.dc2, "service")
    try:
        with lab.step(f"{host.name}, verifying: another address's certificate: 0x80090325"):
            is_refused(join(host, server=IMPOSTOR), UNTRUSTED)
    finally:
        stop(impostor)
    with lab.step(f"{host.name}, verifying: another certificate pinned: 0x80090325"):
        pin(lab, host, "impostor")
        is_refused(join(host), UNTRUSTED)
    host.write("/etc/tessel/tslauth/camservers.conf", "")


def no_credentials(lab, host, codes):
    """Not in any file that the host can have written, and not in what a process of it shows."""
    secrets = [SERVICE_PASSWORD, SERVICE_USER, PASSWORD]
    for code in codes:
        secrets += [code, code.replace("-", "")]
    with lab.step(f"{host.name}: no file of it and no process holds a password or a code"):
        found = host.run("grep", "-rlaF", "-f", "-", "/etc", "/run", "/var/lib/samba",
                         "/var/cache/samba", "/var/log/samba", "/home",
                         text="\n".join(secrets) + "\n")
        expect_equal(found.out, "", "the files that hold one of them")
        seen = host.shell('cat /proc/[0-9]*/cmdline /proc/[0-9]*/environ 2>/dev/null || true').out
        expect(not any(secret in seen for secret in secrets), "a process shows one")


def service_says_nothing(lab, codes):
    with lab.step("the service's log names hosts, and no code, password or blob"):
        log = lab.dc1.read("/run/cam/log")
        for secret in [SERVICE_PASSWORD, *codes, *(code.replace("-", "") for code in codes)]:
            expect(secret not in log, log)
        expect(not re.search(r"[A-Za-z0-9+/]{64}", log), log)
        for line in log.strip().splitlines()[-3:]:
            lab.say(line)


MUTE = """
import socket, sys
listener = socket.create_server(("127.0.0.1", 8989))
print(flush=True)
sys.stdin.read()
"""


def ask_silence(host):
    """What the library says to a server that takes connections and never says a word."""
    server = host.start("/usr/bin/python3", "-c", MUTE, stdin=subprocess.PIPE,
                        stdout=subprocess.PIPE)
    server.stdout.readline()
    try:
        return host.library("join-cam", "127.0.0.1")
    finally:
        stop(server)


def stop(process):
    process.terminate()
    process.wait(10)


def play(lab):
    dc1 = lab.dc1
    pinning, verifying, bystander, patient = lab.hosts(4)
    service = None
    with lab.step("the service runs next to the controller"):
        make_certificates(dc1)
        make_account(dc1)
        service = start_service(dc1)
    if service is None:
        return  # nothing below could say more than that step has
    impostor = start_impostor(dc1, lab.dc2)
    try:
        with concurrent.futures.ThreadPoolExecutor() as pool:
            for host, verify in ((pinning, 0), (verifying, 1), (bystander, 0), (patient, 1)):
                set_up_host(host, verify)
            silence = pool.submit(ask_silence, patient)
            refusals(lab, pinning)
            stop(impostor)
            codes = [joins(lab, pinning)]
            chain(lab, verifying)
            codes.append(joins(lab, verifying))
            code_counts_once(lab, pinning, codes[0])
            pin(lab, bystander, "service")
            code_of_another(lab, bystander, pinning)
            user_logs_in(lab, pinning)
            user_logs_in(lab, verifying)
            no_credentials(lab, pinning, codes)
            no_credentials(lab, verifying, codes)
            service_says_nothing(lab, codes)
            with lab.step("a server that says nothing: WSATimedOutException") as step:
                result = silence.result()
                step.took(result.seconds)
                library_is_refused(result, SILENT)
    finally:
        dc1.run("pkill", "-KILL", "-f", "tslauth-cam-service serve")
        service.wait(10)
        impostor.kill()
        impostor.wait(10)
    with lab.step("the service is down: ConnectionRefusedException, exit code 8"):
        is_refused(join(bystander), UNREACHED, UNREACHABLE)
        library_is_refused(bystander.library("join-cam", SERVER), UNREACHED)
