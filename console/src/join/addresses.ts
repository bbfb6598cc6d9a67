// Is this an address in the forms that the appliance takes, and no other?

// Four numbers from 0 to 255 in decimal, without leading zeros.
export function isIpv4(text: string): boolean {
  const parts = text.split('.');
  return parts.length === 4 && parts.every((part) => /^(0|[1-9]\d{0,2})$/.test(part) && Number(part) <= 255);
}

// Eight groups of one to four hexadecimal digits; "::" once for groups of zeros; the last two may be an IPv4 address.
export function isIpv6(text: string): boolean {
  const halves = text.split('::');
  if (halves.length > 2) return false;
  const sizes = halves.map((half, index) => sizeOfGroups(half, index === halves.length - 1));
  const [head = -1, tail = 0] = sizes;
  if (sizes.includes(-1)) return false;
  // "::" stands for one group at least.
  return halves.length === 1 ? head === 8 : head + tail <= 7;
}

// How many groups these are; -1: none.
function sizeOfGroups(text: string, last: boolean): number {
  if (text === '') return 0;
  const groups = text.split(':');
  let size = 0;
  for (const [index, group] of groups.entries()) {
    if (/^[0-9a-f]{1,4}$/i.test(group)) size += 1;
    else if (last && index === groups.length - 1 && isIpv4(group)) size += 2;
    else return -1;
  }
  return size;
}

export function isAddress(text: string): boolean {
  return isIpv4(text) || isIpv6(text);
}

// An address of a DNS server: also an IPv6 address of the link with the interface, as fe80::1%eth0.
export function isServerAddress(text: string): boolean {
  if (isAddress(text)) return true;
  const mark = text.indexOf('%');
  if (mark < 0) return false;
  const name = text.slice(mark + 1);
  return (
    isLinkLocal(text.slice(0, mark)) && /^[A-Za-z0-9._-]{1,15}$/.test(name) && name !== '.' && name !== '..'
  );
}

// fe80::/10
function isLinkLocal(text: string): boolean {
  return isIpv6(text) && /^fe[89ab][0-9a-f]:/i.test(text);
}
