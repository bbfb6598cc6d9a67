// What the five options may be.

import { isInt32 } from './schedule';

export interface DomainOptions {
  enable_sync_time: boolean;
  enable_server_signing: boolean;
  enable_rpc_enum_usergroup: boolean;
  domain_nested_group: number;
  disable_domain_admins: boolean;
}

export type OptionName = keyof DomainOptions;
export type SwitchName = Exclude<OptionName, 'domain_nested_group'>;

// In the order in which they are shown.
export const SWITCHES: readonly SwitchName[] = [
  'enable_sync_time',
  'enable_server_signing',
  'enable_rpc_enum_usergroup',
  'disable_domain_admins',
];
export const OPTION_NAMES: readonly OptionName[] = [...SWITCHES, 'domain_nested_group'];

export const LEAST_DEPTH = 1;
export const MOST_DEPTH = 99;

export interface OptionRefusal {
  // 2618 as the module refuses it; null for a depth that the module stores but takes for 1 ever after.
  code: 2618 | null;
  option: OptionName;
}

// The first option that is not to be sent; null when all are fine.
export function refusedOptions(parameters: Record<string, unknown>): OptionRefusal | null {
  for (const option of SWITCHES) {
    if (option in parameters && typeof parameters[option] !== 'boolean') {
      return { code: 2618, option };
    }
  }
  const option = 'domain_nested_group';
  if (!(option in parameters)) {
    return null;
  }
  const depth = parameters[option];
  if (!isInt32(depth)) {
    return { code: 2618, option };
  }
  return depth < LEAST_DEPTH || depth > MOST_DEPTH ? { code: null, option } : null;
}

// The depth that was typed in, or null when it is no whole number from 1 to 99.
export function parseDepth(text: string): number | null {
  const trimmed = text.trim();
  if (!/^\d{1,9}$/.test(trimmed)) {
    return null;
  }
  const depth = Number(trimmed);
  return depth < LEAST_DEPTH || depth > MOST_DEPTH ? null : depth;
}

// Those of `wanted` that differ from `stored`: all that "set" needs.
export function changedOptions(stored: DomainOptions, wanted: DomainOptions): Partial<DomainOptions> {
  return Object.fromEntries(
    OPTION_NAMES.filter((name) => stored[name] !== wanted[name]).map((name) => [name, wanted[name]]),
  );
}

// What another has changed since `base` was read, where it stands in the way: the options that differ between `base`

// and `stored` and that are changed here to something else. Changes elsewhere that agree, or touch other options, are

// no conflict.
export function conflictingOptions(
  base: DomainOptions,
  stored: DomainOptions,
  wanted: DomainOptions,
): OptionName[] {
  return OPTION_NAMES.filter(
    (name) => stored[name] !== base[name] && wanted[name] !== base[name] && wanted[name] !== stored[name],
  );
}
