// The tables that are also sent to a real module (tests/e2e/test_page_rules.py): the page refuses what it refuses.

import { readFileSync } from 'node:fs';
import { resolve } from 'node:path';
import { describe, expect, it } from 'vitest';
import { checkForm, parametersOf, type JoinForm } from '../join/rules';
import { refusedOptions } from './options';
import { refusedSchedule } from './schedule';

interface Vector {
  parameters: Record<string, unknown>;
  code: number | null;
  page?: 'refused';
}

function vectors(name: string): Vector[] {
  const path = resolve(__dirname, '../../../tests/console-rules', `${name}.json`);
  return (JSON.parse(readFileSync(path, 'utf8')) as { vectors: Vector[] }).vectors;
}

describe('schedule', () => {
  const table = vectors('schedule');

  it('has vectors of every outcome', () => {
    expect(new Set(table.map((vector) => vector.code))).toEqual(new Set([null, 2617, 2618]));
  });

  it.each(table)('$parameters: $code', ({ parameters, code }) => {
    expect(refusedSchedule(parameters)?.code ?? null).toBe(code);
  });
});

describe('options', () => {
  const table = vectors('options');

  it('has vectors of every outcome', () => {
    expect(new Set(table.map((vector) => vector.code))).toEqual(new Set([null, 2618]));
    expect(table.some((vector) => vector.page === 'refused')).toBe(true);
  });

  it.each(table)('$parameters: $code $page', ({ parameters, code, page }) => {
    const refusal = refusedOptions(parameters);
    expect(refusal !== null).toBe(code !== null || page === 'refused');
    expect(refusal?.code ?? null).toBe(code);
  });
});

// A vector as the join dialog would hold it; null when its fields can't hold such values.
function formOf(parameters: Record<string, unknown>): JoinForm | null {
  const {
    enable_domain,
    domain_name = '',
    username = '',
    password = '',
    dns = '',
    manage_mode = 0,
  } = parameters;
  const { advance_domain_conf: advanced = { enable_advance_option: false } } = parameters;
  if (enable_domain !== true || typeof advanced !== 'object' || advanced === null) return null;
  const options = advanced as Record<string, unknown>;
  const { enable_advance_option, kdc = '', netbios_name = '', fqdn_name = '', register_nics = [] } = options;
  const texts = [domain_name, username, password, dns, kdc, netbios_name, fqdn_name];
  if (typeof enable_advance_option !== 'boolean' || !Array.isArray(register_nics)) return null;
  if (!texts.every((text) => typeof text === 'string')) return null;
  const all = register_nics.length === 0 || register_nics.includes('all');
  return {
    domain: String(domain_name),
    user: String(username),
    password: String(password),
    dns: String(dns),
    trusted: manage_mode === 0,
    kdc: String(kdc),
    netbios: String(netbios_name),
    fqdn: String(fqdn_name),
    nics: all ? null : (register_nics as string[]),
  };
}

describe('join', () => {
  const table = vectors('join').flatMap(({ parameters, code }) => {
    const form = formOf(parameters);
    return form === null ? [] : [{ form, code, parameters }];
  });

  it('has vectors of every outcome', () => {
    expect(new Set(table.map((vector) => vector.code))).toEqual(new Set([null, 2601, 2618]));
  });

  it.each(table)('$parameters: $code', ({ form, code, parameters }) => {
    const problems = checkForm(form);
    expect(Object.keys(problems).length > 0).toBe(code !== null);
    if (code === null) {
      const { domain_name, username, password } = parameters;
      expect(parametersOf(form)).toMatchObject({ enable_domain: true, domain_name, username, password });
    }
  });
});
