import { t } from '../texts';
import type { Problem } from './rules';

// What is wrong, in words; null when nothing is.
export function problemText(problem: Problem | null | undefined): string | null {
  if (problem === null || problem === undefined) return null;
  if (typeof problem === 'string') return t(`join.check.${problem}`);
  if ('tooLong' in problem) return t('join.check.tooLong', { most: problem.tooLong });
  return t('join.check.dnsInvalid', { entry: problem.dnsInvalid });
}
