import { en } from '../texts/en';
import { t, type PlainKey } from '../texts';

// A step's name in words; a step that this page does not know keeps the name that the appliance gives it.
export function stepName(name: string): string {
  const key = `step.${name.replaceAll(' ', '_')}`;
  return key in en ? t(key as PlainKey) : name;
}
