// SPDX-License-Identifier: Apache-2.0
//! The example provider once more, in Rust, to show that plain C is all the interface asks for. Its
//! directory is that of providers/example: the same files, the same answers. No crates; the C
//! library's functions that it needs are declared below.
//!
//! Nothing unwinds into C: the library is built with `-C panic=abort`, and every index and every
//! conversion below is one that cannot fail, or is asked about. A thread that is cancelled unwinds
//! as well, so that cancellation is off while an entry runs.

use std::ffi::CStr;
use std::fs;
use std::io::{ErrorKind, Write};
use std::os::raw::{c_char, c_int, c_void};
use std::os::unix::fs::{DirBuilderExt, OpenOptionsExt};
use std::path::Path;
use std::ptr::null_mut;
use std::sync::atomic::{AtomicU32, Ordering};

const DNS_NAME: &[u8] = b"example.test";
const NETBIOS_NAME: &[u8] = b"EXAMPLE";
const USERS: &str = "/etc/tslauth-example/passwords";
const ACCOUNTS: &str = "/etc/tslauth-example/accounts";
const STATE: &str = "/var/lib/tslauth-example";
const JOINED: &str = "/var/lib/tslauth-example/joined";
const CONTROLLERS: &str = "/var/lib/tslauth-example/controllers";

// ---- The interface, as tslauth_provider.h has it --------------------------------------------

const SUCCESS: c_int = 0;
const FILE_NOT_FOUND: c_int = 2;
const ACCESS_DENIED: c_int = 5;
const INVALID_PARAMETER: c_int = 87;
const INVALID_COMPUTER_NAME: c_int = 1210;
const NO_SUCH_USER: c_int = 1317;
const LOGON_FAILURE: c_int = 1326;
const NO_SUCH_DOMAIN: c_int = 1355;
const INTERNAL_ERROR: c_int = 1359;
const SETUP_ALREADY_JOINED: c_int = 2691;
const TRUST_IN_ORDER: c_int = 0;
const TRUST_NO_CONTROLLER: c_int = 2;
const TRUST_NOT_JOINED: c_int = 7;

type Text = *const c_char;
type Release = unsafe extern "C" fn(*mut c_void);

#[repr(C)]
pub struct Credentials {
    user_name: Text,
    password: Text,
}

#[repr(C)]
pub struct Domain {
    dns_name: Text,
    netbios_name: Text,
}

#[repr(C)]
pub struct DomainInformation {
    unused: Text,
    netbios_domain_name: Text,
    dns_domain_name: Text,
    domain_sid: Text,
}

#[repr(C)]
pub struct MachineAccount {
    account_name: Text,
    dns_domain_name: Text,
    unused: Text,
    first_result: Text,
    second_result: Text,
}

#[repr(C)]
pub struct Metadata {
    api_version: i32,
    pam_module: Text,
    pam_module_parameters: Text,
    nss_module: Text,
    nss_module_parameters: Text,
}
unsafe impl Sync for Metadata {} // constants alone

type TextEntry = unsafe extern "C" fn(Text, *mut *mut c_char, *mut Option<Release>) -> c_int;

#[repr(C)]
pub struct Operations {
    api_version: i32,
    join_domain: Option<unsafe extern "C" fn(Text, Text, *const Credentials) -> c_int>,
    part_domain: Option<unsafe extern "C" fn(*const Credentials) -> c_int>,
    get_active_domain: Option<unsafe extern "C" fn(*mut Domain, *mut Option<Release>) -> c_int>,
    set_preferred_domain_controllers: Option<unsafe extern "C" fn(*const Text) -> c_int>,
    get_preferred_domain_controllers:
        Option<unsafe extern "C" fn(*mut *mut *mut c_char, *mut Option<Release>) -> c_int>,
    unused: Option<unsafe extern "C" fn()>,
    get_domain_trust_state: Option<unsafe extern "C" fn() -> c_int>,
    get_trusted_domains:
        Option<unsafe extern "C" fn(*mut *mut *mut Domain, *mut Option<Release>) -> c_int>,
    get_machine_account_dn:
        Option<unsafe extern "C" fn(*mut *mut c_char, *mut Option<Release>) -> c_int>,
    get_any_domain_controller: Option<
        unsafe extern "C" fn(Text, Text, *mut *mut c_char, *mut Option<Release>) -> c_int,
    >,
    convert_canonical_username: Option<TextEntry>,
    join_domain_with_machine_account:
        Option<unsafe extern "C" fn(*const DomainInformation, *const MachineAccount) -> c_int>,
    get_host_principal_for_domain: Option<TextEntry>,
    get_domain_trust_relationship: Option<unsafe extern "C" fn(Text) -> c_int>,
}

extern "C" {
    fn malloc(size: usize) -> *mut c_void;
    fn free(memory: *mut c_void);
    fn gethostname(name: *mut c_char, size: usize) -> c_int;
    fn pthread_setcancelstate(state: c_int, before: *mut c_int) -> c_int;
}

const PTHREAD_CANCEL_DISABLE: c_int = 1; // of the C library of Linux

// ---- What crosses it ------------------------------------------------------------------------

type Answer<T> = Result<T, c_int>;

/// Runs the body of an entry, while its thread is not cancelled.
fn entry(body: impl FnOnce() -> Answer<()>) -> c_int {
    let mut before = 0;
    unsafe { pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &mut before) };
    let code = body().err().unwrap_or(SUCCESS);
    unsafe { pthread_setcancelstate(before, null_mut()) };
    code
}

/// A text of the caller's, for as long as the call.
unsafe fn bytes<'a>(text: Text) -> Option<&'a [u8]> {
    if text.is_null() {
        None
    } else {
        Some(CStr::from_ptr(text).to_bytes())
    }
}

/// A copy that free(3) releases.
fn copy(text: &[u8]) -> Answer<*mut c_char> {
    unsafe {
        let memory = malloc(text.len() + 1) as *mut u8;
        if memory.is_null() {
            return Err(8);
        }
        std::ptr::copy_nonoverlapping(text.as_ptr(), memory, text.len());
        *memory.add(text.len()) = 0;
        Ok(memory as *mut c_char)
    }
}

unsafe fn hand_out(
    text: &[u8],
    slot: *mut *mut c_char,
    release: *mut Option<Release>,
) -> Answer<()> {
    *slot = copy(text)?;
    *release = Some(free);
    Ok(())
}

/// An array of texts in one block, the pointers first.
fn array_of(texts: &[&[u8]]) -> Answer<*mut *mut c_char> {
    let pointers = (texts.len() + 1) * std::mem::size_of::<*mut c_char>();
    let size: usize = texts.iter().map(|text| text.len() + 1).sum();
    unsafe {
        let array = malloc(pointers + size) as *mut *mut c_char;
        if array.is_null() {
            return Err(8);
        }
        let mut end = (array as *mut u8).add(pointers);
        for (i, text) in texts.iter().enumerate() {
            std::ptr::copy_nonoverlapping(text.as_ptr(), end, text.len());
            *end.add(text.len()) = 0;
            *array.add(i) = end as *mut c_char;
            end = end.add(text.len() + 1);
        }
        *array.add(texts.len()) = null_mut();
        Ok(array)
    }
}

// ---- Files ----------------------------------------------------------------------------------

fn code_of(error: &std::io::Error) -> c_int {
    match error.kind() {
        ErrorKind::PermissionDenied => ACCESS_DENIED,
        ErrorKind::NotFound => FILE_NOT_FOUND,
        ErrorKind::AlreadyExists => SETUP_ALREADY_JOINED,
        _ if error.raw_os_error() == Some(30) => ACCESS_DENIED, // EROFS
        _ => INTERNAL_ERROR,
    }
}

/// The whole of a file; nothing where there is none.
fn read(path: &str) -> Answer<Option<Vec<u8>>> {
    match fs::read(path) {
        Ok(text) => Ok(Some(text)),
        Err(error) if error.kind() == ErrorKind::NotFound => Ok(None),
        Err(error) => Err(code_of(&error)),
    }
}

/// Puts a complete file at `path`: over an older one, or, if `first`, only where there is none.
fn write(path: &str, text: &[u8], first: bool) -> Answer<()> {
    static NUMBER: AtomicU32 = AtomicU32::new(0);
    let number = NUMBER.fetch_add(1, Ordering::Relaxed);
    let temporary = format!("{}/.new-{}-{}", STATE, std::process::id(), number);
    let result = (|| {
        fs::DirBuilder::new().recursive(true).mode(0o755).create(STATE)?;
        let mut options = fs::OpenOptions::new();
        options.write(true).create(true).truncate(true).mode(0o644);
        let mut file = options.open(&temporary)?;
        file.write_all(text)?;
        file.sync_all()?;
        if first {
            fs::hard_link(&temporary, path)
        } else {
            fs::rename(&temporary, path)
        }
    })();
    if result.is_err() || first {
        let _ = fs::remove_file(&temporary); // a leftover does no harm
    }
    result.map_err(|error| code_of(&error))
}

/// What stands behind `name` and a colon.
fn find<'a>(text: &'a [u8], name: &[u8]) -> Option<&'a [u8]> {
    text.split(|byte| *byte == b'\n')
        .find(|line| line.len() > name.len() && line.starts_with(name) && line[name.len()] == b':')
        .map(|line| &line[name.len() + 1..])
}

// ---- Questions that several entries ask -----------------------------------------------------

fn is_our_domain(domain: &[u8]) -> bool {
    domain.eq_ignore_ascii_case(DNS_NAME) || domain.eq_ignore_ascii_case(NETBIOS_NAME)
}

fn is_joined() -> bool {
    Path::new(JOINED).exists()
}

fn check_account(name: Option<&[u8]>, secret: Option<&[u8]>) -> Answer<()> {
    let (name, secret) = match (name, secret) {
        (Some(name), Some(secret)) => (name, secret),
        _ => return Err(INVALID_PARAMETER),
    };
    let accounts = read(ACCOUNTS)?.unwrap_or_default();
    match find(&accounts, name) {
        Some(expected) if !expected.is_empty() && expected == secret => Ok(()),
        _ => Err(LOGON_FAILURE),
    }
}

/// This host's name without its domain.
fn host_name() -> Answer<Vec<u8>> {
    let mut name = [0u8; 65];
    if unsafe { gethostname(name.as_mut_ptr() as *mut c_char, name.len() - 1) } != 0 {
        return Err(INTERNAL_ERROR);
    }
    let end = name.iter().position(|byte| *byte == 0 || *byte == b'.').unwrap_or(0);
    Ok(name[..end].to_vec())
}

fn remember_join() -> Answer<()> {
    let host = host_name()?;
    write(JOINED, &[b"CN=", &host[..], b",CN=Computers,DC=example,DC=test"].concat(), true)
}

// ---- The entries ----------------------------------------------------------------------------

unsafe extern "C" fn join_domain(domain: Text, unit: Text, by: *const Credentials) -> c_int {
    entry(|| {
        if !is_our_domain(bytes(domain).unwrap_or_default()) {
            return Err(NO_SUCH_DOMAIN);
        }
        if !unit.is_null() {
            return Err(FILE_NOT_FOUND); // a directory in plain files has no units
        }
        check_account(bytes((*by).user_name), bytes((*by).password))?;
        remember_join()
    })
}

unsafe extern "C" fn join_with_machine_account(
    domain: *const DomainInformation,
    account: *const MachineAccount,
) -> c_int {
    entry(|| {
        if !is_our_domain(bytes((*domain).dns_domain_name).unwrap_or_default()) {
            return Err(NO_SUCH_DOMAIN);
        }
        check_account(bytes((*account).account_name), bytes((*account).first_result))?;
        remember_join()
    })
}

unsafe extern "C" fn part_domain(by: *const Credentials) -> c_int {
    entry(|| {
        if !by.is_null() {
            check_account(bytes((*by).user_name), bytes((*by).password))?;
        }
        fs::remove_file(JOINED).map_err(|error| match error.kind() {
            ErrorKind::NotFound => NO_SUCH_DOMAIN,
            _ => code_of(&error),
        })
    })
}

unsafe extern "C" fn get_active_domain(
    domain: *mut Domain,
    release: *mut Option<Release>,
) -> c_int {
    entry(|| {
        if !is_joined() {
            return Ok(()); // both names stay null: there is no active domain
        }
        let dns_name = copy(DNS_NAME)?;
        let netbios_name = copy(NETBIOS_NAME).map_err(|code| {
            free(dns_name as *mut c_void);
            code
        })?;
        *domain = Domain { dns_name, netbios_name };
        *release = Some(free);
        Ok(())
    })
}

unsafe extern "C" fn set_preferred(controllers: *const Text) -> c_int {
    entry(|| {
        let mut text = Vec::new();
        let mut next = controllers;
        while let Some(name) = bytes(*next) {
            if name.is_empty() || name.contains(&b'\n') {
                return Err(INVALID_COMPUTER_NAME);
            }
            text.extend_from_slice(name);
            text.push(b'\n');
            next = next.add(1);
        }
        write(CONTROLLERS, &text, false)
    })
}

fn preferred(text: &[u8]) -> Vec<&[u8]> {
    text.split(|byte| *byte == b'\n').filter(|name| !name.is_empty()).collect()
}

unsafe extern "C" fn get_preferred(
    controllers: *mut *mut *mut c_char,
    release: *mut Option<Release>,
) -> c_int {
    entry(|| {
        if let Some(text) = read(CONTROLLERS)? {
            *controllers = array_of(&preferred(&text))?;
            *release = Some(free);
        }
        Ok(())
    })
}

unsafe extern "C" fn get_trust_state() -> c_int {
    let mut state = TRUST_NOT_JOINED;
    entry(|| {
        if is_joined() {
            let readable = fs::File::open(USERS).is_ok();
            state = if readable { TRUST_IN_ORDER } else { TRUST_NO_CONTROLLER };
        }
        Ok(())
    });
    state
}

/// The one domain, in one block; its names are constants and need no releasing.
unsafe extern "C" fn get_trusted_domains(
    domains: *mut *mut *mut Domain,
    release: *mut Option<Release>,
) -> c_int {
    #[repr(C)]
    struct Block {
        array: [*mut Domain; 2],
        own: Domain,
    }
    entry(|| {
        if !is_joined() {
            return Ok(());
        }
        let block = malloc(std::mem::size_of::<Block>()) as *mut Block;
        if block.is_null() {
            return Err(8);
        }
        let own = Domain {
            dns_name: b"example.test\0".as_ptr() as Text,
            netbios_name: b"EXAMPLE\0".as_ptr() as Text,
        };
        block.write(Block { array: [&mut (*block).own, null_mut()], own });
        *domains = (*block).array.as_mut_ptr();
        *release = Some(free);
        Ok(())
    })
}

unsafe extern "C" fn get_machine_account(
    name: *mut *mut c_char,
    release: *mut Option<Release>,
) -> c_int {
    entry(|| match read(JOINED)? {
        Some(text) => hand_out(&text, name, release),
        None => Ok(()),
    })
}

unsafe extern "C" fn get_any_controller(
    _first: Text, // there is nothing to choose from
    domain: Text,
    controller: *mut *mut c_char,
    release: *mut Option<Release>,
) -> c_int {
    entry(|| {
        if !is_our_domain(bytes(domain).unwrap_or_default()) {
            return Err(NO_SUCH_DOMAIN);
        }
        let text = read(CONTROLLERS)?.unwrap_or_default();
        match preferred(&text).first() {
            Some(name) => hand_out(name, controller, release),
            None => hand_out(&host_name()?, controller, release),
        }
    })
}

/// "EXAMPLE\user" and "user@example.test" are "user" to this host, if the directory knows it.
unsafe extern "C" fn convert_username(
    name: Text,
    canonical: *mut *mut c_char,
    release: *mut Option<Release>,
) -> c_int {
    entry(|| {
        let name = bytes(name).unwrap_or_default();
        let backslash = name.iter().position(|byte| *byte == b'\\');
        let at = name.iter().rposition(|byte| *byte == b'@');
        let (domain, user) = match (backslash, at) {
            (Some(place), _) => (&name[..place], &name[place + 1..]),
            (None, Some(place)) => (&name[place + 1..], &name[..place]),
            (None, None) => (DNS_NAME, name),
        };
        if !is_our_domain(domain) {
            return Err(NO_SUCH_DOMAIN);
        }
        let users = fs::read(USERS).map_err(|error| code_of(&error))?;
        find(&users, user).ok_or(NO_SUCH_USER)?;
        hand_out(user, canonical, release)
    })
}

unsafe extern "C" fn get_principal(
    domain: Text,
    principal: *mut *mut c_char,
    release: *mut Option<Release>,
) -> c_int {
    entry(|| {
        if !is_our_domain(bytes(domain).unwrap_or_default()) || !is_joined() {
            return Err(NO_SUCH_DOMAIN);
        }
        hand_out(&[b"host/", &host_name()?[..], b"@EXAMPLE.TEST"].concat(), principal, release)
    })
}

unsafe extern "C" fn get_relationship(domain: Text) -> c_int {
    let mut relationship = 0;
    entry(|| {
        let ours = is_our_domain(bytes(domain).unwrap_or_default());
        relationship = (ours && is_joined()) as c_int;
        Ok(())
    });
    relationship
}

// ---- The records ----------------------------------------------------------------------------

#[no_mangle]
#[allow(non_upper_case_globals)]
pub static ActiveDirectoryClientMetadata: Metadata = Metadata {
    api_version: 2,
    pam_module: b"pam_pwdfile.so\0".as_ptr() as Text,
    pam_module_parameters: b"pwdfile=/etc/tslauth-example/passwords\0".as_ptr() as Text,
    nss_module: b"extrausers\0".as_ptr() as Text,
    nss_module_parameters: std::ptr::null(),
};

#[no_mangle]
#[allow(non_upper_case_globals)]
pub static ActiveDirectoryClientOperations: Operations = Operations {
    api_version: 2,
    join_domain: Some(join_domain),
    part_domain: Some(part_domain),
    get_active_domain: Some(get_active_domain),
    set_preferred_domain_controllers: Some(set_preferred),
    get_preferred_domain_controllers: Some(get_preferred),
    unused: None,
    get_domain_trust_state: Some(get_trust_state),
    get_trusted_domains: Some(get_trusted_domains),
    get_machine_account_dn: Some(get_machine_account),
    get_any_domain_controller: Some(get_any_controller),
    convert_canonical_username: Some(convert_username),
    join_domain_with_machine_account: Some(join_with_machine_account),
    get_host_principal_for_domain: Some(get_principal),
    get_domain_trust_relationship: Some(get_relationship),
};
