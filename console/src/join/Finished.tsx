import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { ExpandableSection } from '@patternfly/react-core/dist/esm/components/ExpandableSection';
import { t } from '../texts';
import type { Job } from './job';
import { Leftovers } from './Leftovers';
import { StepList } from './StepList';

type Done = Extract<Job, { state: 'done' }>;

// The record names an account that stays behind; without a record, one that was not deleted may still be there.
function fateOf(account: string, { record, deleted }: Done) {
  if (deleted) {
    return 'leave.done.deleted';
  }
  const stays = record === null || record.leftovers.some((item) => item.includes(account));
  return stays ? 'leave.done.stays' : 'leave.done.gone';
}

// What came of a join or leave that succeeded.
export function Finished({ job }: { job: Done }) {
  const { action, domain, record, account } = job;
  return (
    <div className="vorn-running">
      <div role="status">
        <Alert isInline variant="success" component="p" title={t(`${action}.done`, { domain })}>
          {action === 'leave' && account !== null && <p>{t(fateOf(account, job), { account })}</p>}
        </Alert>
      </div>
      {record !== null && <Leftovers items={record.leftovers} />}
      {record !== null && (
        <ExpandableSection toggleText={t('steps.title')}>
          <StepList steps={record.steps} />
        </ExpandableSection>
      )}
    </div>
  );
}
