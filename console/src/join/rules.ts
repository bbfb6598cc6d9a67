// What a join may be asked for: what the appliance would refuse is refused here already, and nothing else. Each check
// gives back null when all is well.

import type { JoinParameters } from '../api/types';
import { isAddress, isServerAddress } from './addresses';

export interface JoinForm {
  domain: string;
  user: string;
  password: string;
  // Addresses with commas or blanks in between.
  dns: string;
  trusted: boolean;
  kdc: string;
  netbios: string;
  fqdn: string;
  // Interfaces to register in DNS; null: every one.
  nics: string[] | null;
}

export const emptyForm: JoinForm = {
  domain: '',
  user: '',
  password: '',
  dns: '',
  trusted: true,
  kdc: '',
  netbios: '',
  fqdn: '',
  nics: null,
};

export type Problem =
  | 'domainMissing'
  | 'domainAddress'
  | 'domainInvalid'
  | 'userMissing'
  | 'userDash'
  | 'userPercent'
  | 'control'
  | 'passwordMissing'
  | 'dnsEmpty'
  | 'kdcInvalid'
  | 'netbiosInvalid'
  | 'fqdnInvalid'
  | 'nicsNone'
  | 'nicsLong'
  | { tooLong: number }
  | { dnsInvalid: string };

const kLongestDnsName = 253;
const kLongestNetbiosName = 15;
const kLongestAccountName = 256;
// The appliance keeps this much of the controller's name and of the list of interfaces, and would cut off the rest.
const kLongestStored = 127;

function bytesOf(text: string): number {
  return new TextEncoder().encode(text).length;
}

function hasControls(text: string): boolean {
  // eslint-disable-next-line no-control-regex -- that is what is looked for
  return /[\x00-\x1f\x7f]/.test(text);
}

export function isDnsName(text: string): boolean {
  return (
    text.length <= kLongestDnsName &&
    text.split('.').every((label) => /^[A-Za-z0-9_][A-Za-z0-9_-]{0,62}$/.test(label))
  );
}

export function isNetbiosName(text: string): boolean {
  return (
    /^[^.\- ]/.test(text) &&
    !text.endsWith(' ') &&
    bytesOf(text) <= kLongestNetbiosName &&
    !hasControls(text) &&
    !/[\\/:*?"<>|]/.test(text)
  );
}

export function checkDomain(text: string): Problem | null {
  const name = text.trim();
  if (name === '') return 'domainMissing';
  if (isAddress(name)) return 'domainAddress';
  return isDnsName(name) || isNetbiosName(name) ? null : 'domainInvalid';
}

export function checkUser(text: string): Problem | null {
  const name = text.trim();
  if (name === '') return 'userMissing';
  if (hasControls(name)) return 'control';
  if (name.startsWith('-')) return 'userDash';
  if (name.includes('%')) return 'userPercent';
  return bytesOf(name) > kLongestAccountName ? { tooLong: kLongestAccountName } : null;
}

export function checkPassword(text: string): Problem | null {
  if (text === '') return 'passwordMissing';
  return text.includes('\0') ? 'control' : null;
}

// The addresses: commas, blanks or both in between. Two commas in a row leave an empty entry.
export function splitDns(text: string): string[] {
  const trimmed = text.trim();
  return trimmed === '' ? [] : trimmed.split(/\s*,\s*|\s+/);
}

export function checkDns(text: string): Problem | null {
  const entries = splitDns(text);
  if (entries.includes('')) return 'dnsEmpty';
  const wrong = entries.find((entry) => !isServerAddress(entry));
  return wrong === undefined ? null : { dnsInvalid: wrong };
}

export function checkKdc(text: string): Problem | null {
  const name = text.trim();
  if (name === '') return null;
  if (!isDnsName(name) && !isAddress(name)) return 'kdcInvalid';
  return bytesOf(name) > kLongestStored ? { tooLong: kLongestStored } : null;
}

export function checkNetbios(text: string): Problem | null {
  const name = text.trim();
  return name === '' || isNetbiosName(name) ? null : 'netbiosInvalid';
}

export function checkFqdn(text: string): Problem | null {
  const name = text.trim();
  return name === '' || isDnsName(name) ? null : 'fqdnInvalid';
}

export function checkNics(nics: string[] | null): Problem | null {
  if (nics === null) return null;
  if (nics.length === 0) return 'nicsNone';
  return bytesOf(nics.join(',')) > kLongestStored ? 'nicsLong' : null;
}

export type Field = 'domain' | 'user' | 'password' | 'dns' | 'kdc' | 'netbios' | 'fqdn' | 'nics';

// What is wrong with the form, by field, in the order of the fields.
export function checkForm(form: JoinForm): Partial<Record<Field, Problem>> {
  const checks: [Field, Problem | null][] = [
    ['domain', checkDomain(form.domain)],
    ['user', checkUser(form.user)],
    ['password', checkPassword(form.password)],
    ['dns', checkDns(form.dns)],
    ['kdc', checkKdc(form.kdc)],
    ['netbios', checkNetbios(form.netbios)],
    ['fqdn', checkFqdn(form.fqdn)],
    ['nics', checkNics(form.nics)],
  ];
  return Object.fromEntries(checks.filter(([, problem]) => problem !== null));
}

export const advancedFields: readonly Field[] = ['kdc', 'netbios', 'fqdn', 'nics'];

// How many of the advanced options are set. They are in force when there is one at least.
export function advancedCount(form: JoinForm): number {
  return (
    [form.kdc, form.netbios, form.fqdn].filter((text) => text.trim() !== '').length +
    (form.nics === null ? 0 : 1)
  );
}

// The call's parameters of a form that is in order.
export function parametersOf(form: JoinForm): JoinParameters {
  const dns = splitDns(form.dns).join(',');
  return {
    enable_domain: true,
    domain_name: form.domain.trim(),
    username: form.user.trim(),
    password: form.password,
    ...(dns === '' ? {} : { dns }),
    manage_mode: form.trusted ? 0 : 1,
    ...(advancedCount(form) > 0
      ? {
          advance_domain_conf: {
            enable_advance_option: true,
            kdc: form.kdc.trim(),
            netbios_name: form.netbios.trim(),
            fqdn_name: form.fqdn.trim(),
            register_nics: form.nics ?? ['all'],
          },
        }
      : {}),
  };
}
