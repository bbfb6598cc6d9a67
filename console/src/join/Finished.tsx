import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { ExpandableSection } from '@patternfly/react-core/dist/esm/components/ExpandableSection';
import { t } from '../texts';
import type { Job } from './job';
import { Leftovers } from './Leftovers';
import { StepList } from './StepList';

// What came of a join or leave that succeeded.
export function Finished({ job }: { job: Extract<Job, { state: 'done' }> }) {
  const { action, domain, record, account, deleted } = job;
  return (
    <div className="vorn-running">
      <div role="status">
        <Alert isInline variant="success" component="p" title={t(`${action}.done`, { domain })}>
          {action === 'leave' && account !== null && (
            <p>{t(deleted ? 'leave.done.deleted' : 'leave.done.stays', { account })}</p>
          )}
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
