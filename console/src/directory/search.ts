import { t } from '../texts';

// The appliance takes no longer search, in bytes.
export const kLongestSearch = 256;

// What is searched for: pasted line breaks and tabs are blanks.
export function searchText(typed: string): string {
  // eslint-disable-next-line no-control-regex -- that is what is looked for
  return typed.replace(/[\u0000-\u001f\u007f]+/g, ' ').trim();
}

export function searchProblem(typed: string): string | null {
  const bytes = new TextEncoder().encode(searchText(typed)).length;
  return bytes > kLongestSearch ? t('list.tooLong', { most: kLongestSearch }) : null;
}
