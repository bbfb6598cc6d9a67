import { describe, expect, it } from 'vitest';
import { isIpv4, isIpv6, isServerAddress } from './addresses';
import {
  advancedCount,
  checkDns,
  checkDomain,
  checkForm,
  checkFqdn,
  checkKdc,
  checkNetbios,
  checkNics,
  checkPassword,
  checkUser,
  emptyForm,
  parametersOf,
} from './rules';

const k63 = 'a'.repeat(63);
const kLongestName = `${k63}.${k63}.${k63}.${'a'.repeat(61)}`;

describe('addresses', () => {
  it.each(['0.0.0.0', '10.0.0.1', '255.255.255.255'])('%s is an IPv4 address', (text) => {
    expect(isIpv4(text)).toBe(true);
  });
  it.each(['10.0.0', '10.0.0.256', '10.0.0.01', '10.0.0.1.', ' 10.0.0.1', '1.2.3.4.5', '0x1.2.3.4', ''])(
    '"%s" is none',
    (text) => {
      expect(isIpv4(text)).toBe(false);
    },
  );
  it.each([
    '::',
    '::1',
    '1::',
    'fe80::1',
    '2001:DB8::5',
    '1:2:3:4:5:6:7:8',
    '1:2:3:4:5:6:7::',
    '::ffff:10.0.0.1',
  ])('%s is an IPv6 address', (text) => {
    expect(isIpv6(text)).toBe(true);
  });
  it.each([
    '',
    ':',
    ':::',
    '1::2::3',
    '1:2:3:4:5:6:7',
    '1:2:3:4:5:6:7:8:9',
    '1:2:3:4::5:6:7:8',
    '12345::',
    'g::',
    '10.0.0.1::',
    '::10.0.0.1:1',
    '::10.0.0.256',
    '1:2:3:4:5:6:7:1.2.3.4',
    'fe80::1%eth0',
    '10.0.0.1',
  ])('"%s" is none', (text) => {
    expect(isIpv6(text)).toBe(false);
  });
  it('of DNS servers may name the interface when they are of the link', () => {
    expect(isServerAddress('fe80::1%eth0')).toBe(true);
    expect(isServerAddress('febf::1%br-lan.5')).toBe(true);
    expect(isServerAddress('2001:db8::1%eth0')).toBe(false);
    expect(isServerAddress('fe80::1%')).toBe(false);
    expect(isServerAddress('fe80::1%..')).toBe(false);
    expect(isServerAddress('fe80::1%abcdefghijklmnop')).toBe(false);
    expect(isServerAddress('fe80::1%et h')).toBe(false);
  });
});

describe('the domain', () => {
  it.each(['lab.example.com', 'LAB', '  lab.example.com ', '_a.b', '1.2.3', 'A B', 'ä.ö', k63, kLongestName])(
    '"%s" passes',
    (text) => {
      expect(checkDomain(text)).toBeNull();
    },
  );
  it.each([
    ['', 'domainMissing'],
    ['  ', 'domainMissing'],
    ['10.0.0.1', 'domainAddress'],
    ['fe80::1', 'domainAddress'],
    ['-lab', 'domainInvalid'],
    ['lab..example.com', 'domainInvalid'],
    ['this.domain.ends.with.', 'domainInvalid'],
    ['.this.domain.begins.so', 'domainInvalid'],
    ['lab_that_is.-not', 'domainInvalid'],
    ['*', 'domainInvalid'],
    ['a\tb', 'domainInvalid'],
    ['seventeen letters', 'domainInvalid'],
    ['ääääääää', 'domainInvalid'],
    [`${k63}a.com`, 'domainInvalid'],
    [`${kLongestName}a`, 'domainInvalid'],
  ])('"%s": %s', (text, problem) => {
    expect(checkDomain(text)).toBe(problem);
  });
});

describe('the account', () => {
  it.each(['Administrator', 'LAB\\anna', 'anna@lab.example.com', 'Änna Berg', 'a'.repeat(256)])(
    '"%s" passes',
    (text) => {
      expect(checkUser(text)).toBeNull();
    },
  );
  it.each([
    ['', 'userMissing'],
    ['-anna', 'userDash'],
    ['anna%secret', 'userPercent'],
    ['an\nna', 'control'],
    ['an\x7fna', 'control'],
  ])('"%s": %s', (text, problem) => {
    expect(checkUser(text)).toBe(problem);
  });
  it('is measured in bytes', () => {
    expect(checkUser('ä'.repeat(129))).toEqual({ tooLong: 256 });
  });
  it('needs a password, which may hold anything but NUL', () => {
    expect(checkPassword('')).toBe('passwordMissing');
    expect(checkPassword(' -%\n')).toBeNull();
    expect(checkPassword('a\0b')).toBe('control');
  });
});

describe('the rest', () => {
  it.each(['', '  ', '10.0.0.1', '10.0.0.1,10.0.0.2', '10.0.0.1, ::1', '10.0.0.1 10.0.0.2'])(
    'DNS servers "%s" pass',
    (text) => {
      expect(checkDns(text)).toBeNull();
    },
  );
  it('finds the DNS server that is none', () => {
    expect(checkDns('10.0.0.1, dc1.lab')).toEqual({ dnsInvalid: 'dc1.lab' });
    expect(checkDns('10.0.0.1,,10.0.0.2')).toBe('dnsEmpty');
    expect(checkDns('10.0.0.1,')).toBe('dnsEmpty');
    expect(checkDns(',')).toBe('dnsEmpty');
  });
  it('checks the advanced options', () => {
    for (const text of ['', 'dc1.lab.example.com', '10.0.0.1', '::1']) expect(checkKdc(text)).toBeNull();
    for (const text of ['dc 1', '-dc', '*', 'dc1.']) expect(checkKdc(text)).toBe('kdcInvalid');
    expect(checkKdc(`${k63}.${k63}`)).toBeNull();
    expect(checkKdc(`${k63}.${k63}.a`)).toEqual({ tooLong: 127 });
    for (const text of ['', 'LAB', 'A B', 'FIFTEEN-LETTERS']) expect(checkNetbios(text)).toBeNull();
    for (const text of ['SIXTEEN-LETTERS1', '.LAB', '-LAB', 'A:B', 'A|B', 'A\\B']) {
      expect(checkNetbios(text)).toBe('netbiosInvalid');
    }
    expect(checkFqdn('')).toBeNull();
    expect(checkFqdn('lab.example.com')).toBeNull();
    expect(checkFqdn('lab example')).toBe('fqdnInvalid');
  });
  it('wants one interface, and as many as the appliance keeps', () => {
    expect(checkNics(null)).toBeNull();
    expect(checkNics([])).toBe('nicsNone');
    expect(checkNics(['eth0', 'eth1'])).toBeNull();
    // 8 names of 15 and 7 commas are 127 bytes.
    const names = Array.from({ length: 8 }, (_none, index) => `${index}${'x'.repeat(14)}`);
    expect(checkNics(names)).toBeNull();
    expect(checkNics([...names, 'e'])).toBe('nicsLong');
  });
});

describe('the form', () => {
  const form = { ...emptyForm, domain: ' lab.example.com ', user: ' Administrator ', password: ' secret ' };

  it('says what is wrong in the order of its fields', () => {
    expect(checkForm(form)).toEqual({});
    expect(Object.keys(checkForm({ ...emptyForm, kdc: '*', nics: [], dns: 'x' }))).toEqual([
      'domain',
      'user',
      'password',
      'dns',
      'kdc',
      'nics',
    ]);
  });

  it('becomes the parameters of the call', () => {
    expect(parametersOf(form)).toEqual({
      enable_domain: true,
      domain_name: 'lab.example.com',
      username: 'Administrator',
      password: ' secret ',
      manage_mode: 0,
    });
    expect(parametersOf({ ...form, trusted: false, dns: ' 10.0.0.1 , 10.0.0.2 ' })).toMatchObject({
      manage_mode: 1,
      dns: '10.0.0.1,10.0.0.2',
    });
  });

  it('sends advanced options when one is set', () => {
    expect(advancedCount(form)).toBe(0);
    expect(advancedCount({ ...form, kdc: ' dc1 ', nics: ['eth0'] })).toBe(2);
    expect(parametersOf({ ...form, kdc: ' dc1 ' }).advance_domain_conf).toEqual({
      enable_advance_option: true,
      kdc: 'dc1',
      netbios_name: '',
      fqdn_name: '',
      register_nics: ['all'],
    });
    expect(parametersOf({ ...form, nics: ['eth1'] }).advance_domain_conf?.register_nics).toEqual(['eth1']);
  });
});
