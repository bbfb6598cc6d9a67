import { describe, expect, it } from 'vitest';
import type { DomainOptions } from './options';
import { changedOptions, conflictingOptions, parseDepth } from './options';

const STORED: DomainOptions = {
  enable_sync_time: false,
  enable_server_signing: true,
  enable_rpc_enum_usergroup: false,
  domain_nested_group: 3,
  disable_domain_admins: false,
};

describe('the depth', () => {
  it.each([
    ['1', 1],
    ['99', 99],
    [' 7 ', 7],
    ['007', 7],
  ])('%j is %d', (text, depth) => expect(parseDepth(text)).toBe(depth));

  it.each(['', '0', '100', '-1', '+3', '1.5', '1e1', '0x5', 'three', '9999999999', '٣'])(
    '%j is refused',
    (text) => expect(parseDepth(text)).toBeNull(),
  );
});

describe('changes', () => {
  it('are what differs, and nothing else is sent', () => {
    expect(changedOptions(STORED, STORED)).toEqual({});
    expect(
      changedOptions(STORED, { ...STORED, enable_server_signing: false, domain_nested_group: 4 }),
    ).toEqual({
      enable_server_signing: false,
      domain_nested_group: 4,
    });
  });

  it('collide only where both sides changed the same option to different values', () => {
    const mine = { ...STORED, domain_nested_group: 5 };
    expect(conflictingOptions(STORED, STORED, mine)).toEqual([]);
    expect(conflictingOptions(STORED, { ...STORED, enable_sync_time: true }, mine)).toEqual([]);
    expect(conflictingOptions(STORED, { ...STORED, domain_nested_group: 5 }, mine)).toEqual([]);
    expect(conflictingOptions(STORED, { ...STORED, domain_nested_group: 9 }, mine)).toEqual([
      'domain_nested_group',
    ]);
  });
});
